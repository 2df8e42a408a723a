/// @file rcvlink.h
/// The chief header of rcvlink: everything that a host program needs to reach a GNSS receiver.
///
/// Include it with or without <windows.h> before it, in C++11 or later, with GCC, Clang or a
/// Microsoft-compatible compiler; link with `librcvlink.dll.a` (GNU) or `rcvlink.lib` (Microsoft).
///
/// A host's usual road:
///  1. `dump_hlp::CreateReportFile`, when it wants a trace of everything the library does;
///  2. `devapi::SearchReceiver` (or `CreateReceiverOnSerial`, `CreateReceiverOnUSB` with known
///     settings, or `OpenReceiver` for a port that is open already), which gives a handle;
///  3. any receiver function, in any order; `OpenFileList` before `GetFilesCount` and
///     `GetFileInfo`, and `CloseFileList` after them;
///  4. `devapi::CloseReceiver`, once for each handle that was obtained.
///
/// @par Handles
/// A receiver handle and a file list handle are opaque. Each function looks a handle up before it
/// touches anything, so an unknown, stale or wrong handle gives E_INVALIDARG and nothing else.
///
/// @par Strings
/// Strings are UTF-16. Every string that the library hands out is a BSTR (allocated with
/// SysAllocString): the host frees it with SysFreeString. Strings that the host passes in stay its
/// own and need to live only as long as the call.
///
/// @par Result codes
/// All `devapi` functions return a 32-bit HRESULT:
///
///     0x00000000 S_OK           done
///     0x00000001 S_FALSE        nothing was done, and that is no error: nothing found, aborted, or
///                               other users of the receiver remain
///     0x80070057 E_INVALIDARG   a required pointer is null, a handle is unknown, an index is not
///                               below the count
///     0x8007000E E_OUTOFMEMORY  an allocation failed
///     0x80004001 E_NOTIMPL      this receiver's family does not offer the operation
///     0x80004005 E_FAIL         internal failure; a download of a file of size 0
///     0x8000FFFF E_UNEXPECTED   an `EInstanceType` that is none
///     0x8007048F                (ERROR_DEVICE_NOT_CONNECTED) no connection, no driver, no complete
///                               reply, or the receiver refused the command
///     0x800705B4                (ERROR_TIMEOUT) the receiver stayed silent
///     0x8007xxxx                any other Win32 error, in the low 16 bits; over USB also 0xExxxxxxx
///
/// @par Abort events
/// An abort event is the host's own Win32 event, and should be manual-reset: one that resets itself
/// is spent on the first step that looks at it.
///
/// @par Threads
/// Every function may be called from any thread, unless its comment says otherwise. Each call runs
/// on the caller's thread until it is done; the library starts no threads. Two threads may drive
/// two receivers at once. Operations on one receiver wait for each other; to keep other threads out
/// between operations, bracket them with `LockConnection` and `UnlockConnection`. `Abort` is meant
/// to come from another thread.
#ifndef RCVLINK_API_RCVLINK_H_
#define RCVLINK_API_RCVLINK_H_

#include <stddef.h>

/// Says that a function comes from the DLL. Not for hosts to set.
#ifdef RCVLINK_STATIC
#define RCVLINK_API
#else
#define RCVLINK_API __declspec(dllimport)
#endif

struct IStream;  // COM's stream (objidl.h)
struct _DCB;     // Win32's device control block (winbase.h)
class CIConnection;

#ifdef _MINWINBASE_
/// <windows.h> came first: file times are the platform's own records.
typedef SYSTEMTIME RCVLINK_SYSTEMTIME;
#else
/// The shape of Win32's SYSTEMTIME, for a host that does not include <windows.h>.
struct RCVLINK_SYSTEMTIME {
  unsigned short wYear;          ///< all four digits
  unsigned short wMonth;         ///< 1 to 12
  unsigned short wDayOfWeek;     ///< 0 is Sunday
  unsigned short wDay;           ///< 1 to 31
  unsigned short wHour;          ///< 0 to 23
  unsigned short wMinute;        ///< 0 to 59
  unsigned short wSecond;        ///< 0 to 59
  unsigned short wMilliseconds;  ///< 0 to 999
};
#endif

/// The kind of link to search on.
enum EInstanceType {
  eInstanceAny = 0,     ///< the serial port of that name first, then the USB device of that name
  eInstanceSerial = 1,  ///< serial port only
  eInstanceUSB = 2      ///< USB device only
};

/// The protocol family to probe for. Every other value behaves as `eProtocolAny`.
enum EProtocol {
  eProtocolAny = 0,     ///< Quorin first, then Velmar
  eProtocolQuorin = 1,  ///< Quorin only
  eProtocolVelmar = 2   ///< Velmar only
};

/// A receiver's identity, filled by `devapi::GetReceiverInfo`. 40 bytes.
struct CReceiverInfo {
  /// Mask of the file operations that the receiver's family offers: Quorin 9, Velmar 13. Bit 4
  /// marks renaming; bits 1 and 8 are set for both families.
  unsigned int dwFeatures;
  unsigned int dwPadding;   ///< not written
  wchar_t* bstrReceiverId;  ///< BSTR, the receiver's id; the host frees it
  wchar_t* bstrReserved;    ///< never written; leave it null
  wchar_t* bstrModel;       ///< BSTR, the receiver's model; the host frees it
  unsigned int dwProtocol;  ///< 1 Quorin, 2 Velmar (the numbers of `EProtocol`)
  /// Variant of the family: Velmar 2; Quorin 2 when the model begins with "HVA3" or "HVB5", else 1.
  unsigned int dwVariant;
};

/// One entry of a file list. 56 bytes.
struct CFileInfo {
  unsigned int dwSize;            ///< size in bytes
  unsigned int dwPadding;         ///< zero
  wchar_t* bstrName;              ///< BSTR, the file's name on the receiver
  RCVLINK_SYSTEMTIME stTime1;     ///< the file's time
  RCVLINK_SYSTEMTIME stTime2;     ///< the same time again
  unsigned long long qwReserved;  ///< zero
};

/// How a transfer reports its progress: `pfnProgress(pContext, percent)` with percent 0 to 100.
/// 16 bytes; the host owns it and keeps it alive until the transfer returns.
///
/// The function runs on the thread that runs the transfer, with a lock of the receiver held: it
/// must be quick and must not start another transfer of the same receiver. `Abort` may be called
/// from it. It must not throw.
struct CProgressCallback {
  void (*pfnProgress)(void* pContext, unsigned char percent);  ///< may be null
  void* pContext;                                              ///< passed on as it is
};

static_assert(sizeof(void*) == 8, "rcvlink serves 64-bit hosts");
static_assert(sizeof(wchar_t) == 2, "rcvlink's strings are UTF-16");
static_assert(sizeof(EInstanceType) == 4 && sizeof(EProtocol) == 4, "32-bit enumerations");
static_assert(sizeof(RCVLINK_SYSTEMTIME) == 16, "shape of SYSTEMTIME");
static_assert(sizeof(CReceiverInfo) == 40, "size of CReceiverInfo");
static_assert(offsetof(CReceiverInfo, dwFeatures) == 0, "layout of CReceiverInfo");
static_assert(offsetof(CReceiverInfo, bstrReceiverId) == 8, "layout of CReceiverInfo");
static_assert(offsetof(CReceiverInfo, bstrReserved) == 16, "layout of CReceiverInfo");
static_assert(offsetof(CReceiverInfo, bstrModel) == 24, "layout of CReceiverInfo");
static_assert(offsetof(CReceiverInfo, dwProtocol) == 32, "layout of CReceiverInfo");
static_assert(offsetof(CReceiverInfo, dwVariant) == 36, "layout of CReceiverInfo");
static_assert(sizeof(CFileInfo) == 56, "size of CFileInfo");
static_assert(offsetof(CFileInfo, dwSize) == 0, "layout of CFileInfo");
static_assert(offsetof(CFileInfo, bstrName) == 8, "layout of CFileInfo");
static_assert(offsetof(CFileInfo, stTime1) == 16, "layout of CFileInfo");
static_assert(offsetof(CFileInfo, stTime2) == 32, "layout of CFileInfo");
static_assert(offsetof(CFileInfo, qwReserved) == 48, "layout of CFileInfo");
static_assert(sizeof(CProgressCallback) == 16, "size of CProgressCallback");
static_assert(offsetof(CProgressCallback, pContext) == 8, "layout of CProgressCallback");

/// Receivers, their files and their port settings.
namespace devapi {

/// @name Finding and letting go
/// @{

/// Finds the receiver on a port and registers it under the port's name.
///
/// A receiver already registered under that name is returned at once, with one more user counted.
/// Otherwise the link is searched: on a serial port up to 18 tries (RTS handshake, on, off; at each
/// the port's own speed, then 9600, 115200, 57600, 38400, 19200), each opening the port anew and
/// asking for the families that `protocol` names; on USB a single try, for Quorin only.
///
/// @param port       name of the COM port ("COM7") or path of the USB device, as CreateFileW takes it
/// @param type       the kind of link
/// @param protocol   the family to ask for
/// @param abortEvent Win32 event; once it is signalled the search ends at its next step. Null: the
///                   search cannot be aborted. The caller owns it.
/// @param[in,out] receiver set *receiver to null before the call: the search reads it to learn
///                   whether a receiver was made. On success it holds the handle, to be given back
///                   with `CloseReceiver`.
/// @retval S_OK         found; *receiver holds the handle
/// @retval S_FALSE      no receiver answered, or the search was aborted
/// @retval E_INVALIDARG `port` or `receiver` is null
/// @retval E_UNEXPECTED `type` is none of the three (and the name is not registered)
/// @return otherwise why the port could not be opened: 0x80070002 when it does not exist,
///         0x80070005 when another program has it. A USB device that cannot be opened at all gives
///         S_FALSE; one that refuses its pipes gives why.
RCVLINK_API long SearchReceiver(
    wchar_t* port, EInstanceType type, EProtocol protocol, void* abortEvent, void** receiver);

/// One try on a serial port with settings that the host knows. Parameters as in `SearchReceiver`;
/// an already registered receiver is not looked for, so two calls make two receivers where the
/// port can be opened twice.
/// @param settings Win32's DCB. Its baud rate (0 keeps the port's speed), byte
///                 size, parity, stop bits and the flags fBinary, fParity, fOutxCtsFlow,
///                 fOutxDsrFlow, fDtrControl, fDsrSensitivity, fRtsControl, fAbortOnError are used.
/// @retval S_OK          found; *receiver holds the handle
/// @retval S_FALSE       no receiver answered, or aborted
/// @retval E_INVALIDARG  `port`, `settings` or `receiver` is null
/// @retval E_OUTOFMEMORY an allocation failed
/// @return otherwise why the port could not be opened
RCVLINK_API long CreateReceiverOnSerial(
    wchar_t* port, EProtocol protocol, _DCB* settings, void* abortEvent, void** receiver);

/// One try on a USB device of the USBIO driver, for a Quorin receiver whatever `protocol` says.
/// Parameters as in `SearchReceiver`; `device` is taken as it is, nothing is put in front of it.
/// @retval S_OK          found; *receiver holds the handle
/// @retval S_FALSE       no receiver answered, the device could not be opened, its descriptors have
///                       another layout than those of the receivers, or aborted
/// @retval E_INVALIDARG  `device` or `receiver` is null
/// @retval E_OUTOFMEMORY an allocation failed
/// @return otherwise why the device's pipes could not be used: an HRESULT of a Win32 error, or one of
///         the USBIO driver's own errors (0xE.......)
RCVLINK_API long CreateReceiverOnUSB(wchar_t* device,
                                     EProtocol protocol,
                                     void* abortEvent,
                                     void** receiver);

/// Finds a receiver that is registered already and counts one more user of it.
/// @param port name under which it was registered; letter case counts
/// @retval S_OK         *receiver holds the handle, to be given back with `CloseReceiver`
/// @retval S_FALSE      none of that name; *receiver is left as it was
/// @retval E_INVALIDARG `receiver` is null
RCVLINK_API long OpenReceiver(wchar_t* port, void** receiver);

/// Lets go of a receiver. With its last user the receiver is aborted, unregistered and closed; the
/// handle is unknown from that moment. A call that is still running on another thread keeps the
/// receiver (and its port) alive until it returns; nobody waits for it.
/// @retval S_OK         the receiver was removed
/// @retval S_FALSE      other users remain
/// @retval E_INVALIDARG unknown handle
RCVLINK_API long CloseReceiver(void* receiver);

/// Closes a receiver by name, for a host that lost its handles. Each receiver of that name loses one
/// user, until one of them has none left and is removed. The operation that runs on that one is ended
/// as by `Abort`; as with `CloseReceiver`, nobody waits for it.
/// @retval S_OK         a receiver was removed
/// @retval S_FALSE      none was removed
/// @retval E_INVALIDARG `port` is null
RCVLINK_API long DestroyReceiver(wchar_t* port);
/// @}

/// @name Operations on a receiver
/// All return E_INVALIDARG for an unknown handle and 0x8007048F when the receiver has no
/// connection, besides the results listed.
/// @{

/// Reads the receiver's identity.
/// @param abortEvent Win32 event that ends the wait for a receiver that another thread has locked;
///                   null: that wait cannot be ended. The caller owns it.
/// @param[out] info  filled on success; on failure both strings are null
/// @retval S_OK         the host frees `bstrReceiverId` and `bstrModel`
/// @retval S_FALSE      aborted, or the receiver answered with something else than its identity
/// @retval E_INVALIDARG `info` is null
/// @retval 0x800705B4   a Quorin receiver stayed silent (a Velmar receiver: S_FALSE)
/// @retval 0x8007048F   a Quorin receiver refused (a Velmar receiver: S_FALSE)
/// @return otherwise the failing code of the exchange
/// @warning A failure of a Quorin receiver after the lock was taken leaves the calling thread
///          holding the receiver's lock: call `UnlockConnection` after a result other than S_OK. With
///          a Velmar receiver the failure releases the lock that the call itself took, and no other: a
///          host that holds the receiver with `LockConnection` still does.
RCVLINK_API long GetReceiverInfo(void* receiver, void* abortEvent, CReceiverInfo* info);

/// Asks whether the receiver still answers.
/// @param abortEvent Win32 event that ends the check, and the wait for a receiver that another thread
///                   has locked. Null: `Abort` alone ends the check, and nothing ends that wait.
/// @param[out] answer -1 (VARIANT_TRUE) when it answered, 0 when not
/// @retval S_OK         checked; `answer` is set (an aborted check answers 0)
/// @retval S_FALSE      aborted while another thread held the receiver; `answer` is not written
/// @retval E_INVALIDARG `answer` is null
/// @return otherwise the Win32 error of the wait for the lock, as `LockConnection`
RCVLINK_API long CheckConnection(void* receiver, void* abortEvent, short* answer);

/// Takes the receiver for the calling thread until `UnlockConnection`. The lock counts: it is given
/// back as often as it was taken, by the same thread.
/// @param abortEvent Win32 event that ends the wait; null: wait without limit
/// @retval S_OK    the calling thread holds the receiver
/// @retval S_FALSE the event was signalled first
/// @return otherwise the Win32 error of the wait. A thread that ended while it held the receiver makes
///         the wait of the next one fail so, and yet hands the lock over: call `UnlockConnection`.
RCVLINK_API long LockConnection(void* receiver, void* abortEvent);

/// Gives the receiver back.
/// @retval S_OK always, also when the calling thread did not hold it
RCVLINK_API long UnlockConnection(void* receiver);

/// Ends the operation that another thread runs on the receiver: its wait ends at once, and the
/// operation at its next step. It takes no lock of the receiver and waits for nothing.
///
/// When no operation runs, the next one ends. A Quorin receiver's gives S_FALSE before it sends
/// anything, or, where it asks for the receiver's identity or port first, after that question; a Velmar
/// receiver's sends its command and then gives S_FALSE. A `CheckConnection` answers 0 once.
///
/// `CheckConnection` and the download of a Velmar receiver end too, but do not clear the abort: the
/// next operation other than these two ends with S_FALSE as well.
/// @retval S_OK always
RCVLINK_API long Abort(void* receiver);

/// Copies a file of the receiver into a stream.
/// @param name     name as in the file list, in the thread's ANSI code page on the wire
/// @param stream   COM stream; its Write is called, on the calling thread, and with a Velmar receiver
///                 its AddRef and Release around the transfer
/// @param progress may be null
/// @retval S_OK         done, or so it seems: a host compares the byte count with the size listed. A
///                      Quorin receiver on a serial port gives S_OK also when the stream's Write
///                      failed; a Velmar receiver also for a file that it does not have (nothing is
///                      written then) or that falls silent, and whenever a raised speed was put back,
///                      whatever became of the transfer.
/// @retval S_FALSE      aborted, or ended by the receiver
/// @retval E_INVALIDARG `name` or `stream` is null
/// @retval E_FAIL       a Quorin receiver says that the file's size is 0, or does not say it
/// @retval 0x800705B4   a Quorin receiver stayed silent
/// @retval 0x8007048F   a Quorin receiver refused a command, or sent a block that makes no sense
/// @return otherwise the failing code of the connection, or over USB of the stream's Write
/// @note What a Velmar receiver sends is not checked: a bit that was flipped on the line is in the file, and
///       the result is S_OK. Where it matters, download twice and compare. Quorin blocks carry a CRC that is.
/// @note A Quorin receiver that falls silent between two blocks is asked without end on a serial port
///       whose reads end empty, as those of Windows do: a host that has no patience calls `Abort`.
/// @note Quorin blocks are numbered with 16 bits: a file of more than 65536 blocks of 512 bytes
///       (33554432 bytes) does not come to its end.
RCVLINK_API long DownloadFile(void* receiver,
                              wchar_t* name,
                              IStream* stream,
                              CProgressCallback* progress);

/// Reserved: no family of receivers takes files.
/// @retval E_NOTIMPL always
RCVLINK_API long UploadFile(void* receiver,
                            const CFileInfo* info,
                            IStream* stream,
                            CProgressCallback* progress);

/// Deletes a file of the receiver.
/// @retval S_OK         done. A Velmar receiver gives it also when it refused or stayed silent: a host
///                      that must know reads the directory again.
/// @retval S_FALSE      aborted
/// @retval E_INVALIDARG `name` is null
/// @retval 0x8007048F   the receiver refused
/// @retval 0x800705B4   the receiver stayed silent
RCVLINK_API long DeleteFileW(void* receiver, wchar_t* name);

/// Renames a file of the receiver.
/// @retval S_OK         done, or refused, as with `DeleteFileW`
/// @retval S_FALSE      aborted
/// @retval E_INVALIDARG a name is null
/// @retval E_NOTIMPL    a Quorin receiver: its family does not rename
RCVLINK_API long RenameFile(void* receiver, wchar_t* oldName, wchar_t* newName);
/// @}

/// @name Settings of the receiver's own serial port
/// They change the receiver, not the host's port, and wait for no confirmation. A Quorin receiver is
/// not locked by them: hold it with `LockConnection` when other threads use it.
/// Results: S_OK sent (or, with a Velmar receiver, nothing was sent because it did not tell its port's
/// settings); S_FALSE aborted, or a Quorin receiver did not name its port; 0x800705B4 a Quorin receiver
/// stayed silent.
/// @{

/// @param baudRate bits per second
RCVLINK_API long DCSetRcvBaudrate(void* receiver, unsigned long baudRate);

/// @param parity Quorin: 1 odd, 2 even. Velmar: 1 even, 2 odd. Any other value: none.
RCVLINK_API long DCSetRcvParity(void* receiver, unsigned char parity);

/// @param rts 0 off, any other value on. E_NOTIMPL for a Velmar receiver.
RCVLINK_API long DCSetRcvRTSControl(void* receiver, unsigned char rts);

/// @param stopBits Quorin: 0 one stop bit, any other value two. Velmar: their number.
RCVLINK_API long DCSetRcvStopbits(void* receiver, unsigned char stopBits);
/// @}

/// @name File lists
/// A file list is a snapshot of the receiver's directory: it stays readable after the receiver was
/// closed. Apart from reading the directory itself these functions take no lock: do not call them
/// from several threads at once.
/// @{

/// Reads the receiver's directory.
/// @param[out] fileList the list's handle, to be given back with `CloseFileList`
/// @retval S_OK          read
/// @retval E_INVALIDARG  `fileList` is null, or the receiver's handle is unknown
/// @retval E_OUTOFMEMORY an allocation failed
/// @return otherwise the receiver's result; a failure (negative) makes no list. S_FALSE (the reading
///         was aborted) makes an empty one.
/// @note A Velmar receiver's directory is read through a buffer of 8192 bytes, which holds about 70
///       files: of a larger one the list has the first part. Its silence gives an empty list.
RCVLINK_API long OpenFileList(void* receiver, void** fileList);

/// @param[out] count number of files
/// @retval S_OK         done
/// @retval E_INVALIDARG unknown list, or `count` is null
RCVLINK_API long GetFilesCount(void* fileList, long* count);

/// Copies one entry.
/// @param index 0 to count - 1. A negative index is a programming error: it raises the structured
///              exception EXCEPTION_ARRAY_BOUNDS_EXCEEDED (0xC000008C).
/// @param[out] info the entry; `bstrName` is a copy that the host frees
/// @retval S_OK          done
/// @retval E_INVALIDARG  unknown list, `info` is null, or `index` is not below the count
/// @retval E_OUTOFMEMORY the name could not be copied; `bstrName` is null
RCVLINK_API long GetFileInfo(void* fileList, long index, CFileInfo* info);

/// Frees a file list.
/// @retval S_OK         done
/// @retval E_INVALIDARG unknown list
RCVLINK_API long CloseFileList(void* fileList);
/// @}

}  // namespace devapi

/// The report file: a plain text trace of everything that the library does, one stamped line an
/// event, hidden in the user's temporary folder. The host may write lines of its own into it.
namespace dump_hlp {

/// Starts a report, replacing the one that is open. A report that cannot be created (or whose path
/// would be too long) leaves reporting off; nothing is reported about that.
/// @param name bare file name; the file is made in the folder of GetTempPath
/// @warning Not while other threads are inside the library. A narrow name that is null or cannot be
///          converted raises a C++ exception, as `DumpReportString` does for its format.
RCVLINK_API void CreateReportFile(const char* name);
/// The same with a wide name.
RCVLINK_API void CreateReportFile(const wchar_t* name);

/// Writes one stamped entry; safe without a report. The entry ends where the text ends: end it in
/// "\r\n".
/// @warning A null format, one that cannot be measured, and a lack of memory raise a C++ exception of
///          the library's own runtime, which a host of another compiler cannot catch.
/// @param format    in the meaning of Microsoft's printf
/// @param arguments the caller's own va_list
RCVLINK_API void DumpReportString(const char* format, char* arguments);
/// The same with a wide format.
RCVLINK_API void DumpReportString(const wchar_t* format, char* arguments);

/// Ends the report.
/// @warning Not while other threads are inside the library.
RCVLINK_API void CloseReportFile();

}  // namespace dump_hlp

/// The serial half of `devapi::SearchReceiver`, without the look for a registered receiver.
RCVLINK_API long SearchReceiverOnSerial(wchar_t* port,
                                        EProtocol protocol,
                                        void* abortEvent,
                                        void** receiver);

/// Reserved: connections are not handed out.
/// @retval E_NOTIMPL always; nothing is written
RCVLINK_API long GetConnection(wchar_t* name, EInstanceType type, CIConnection** connection);

#endif  // RCVLINK_API_RCVLINK_H_
