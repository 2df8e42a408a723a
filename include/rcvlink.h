/// @file rcvlink.h
/// The public header of rcvlink: everything that a host program needs to reach a GNSS receiver.
///
/// Include it with or without <windows.h> before it, in C++11 or later, with GCC, Clang or a
/// Microsoft-compatible compiler; link with `librcvlink.dll.a` (GNU) or `rcvlink.lib` (Microsoft).
///
/// Typical use:
///  1. `dump_hlp::CreateReportFile`, for a trace of the library;
///  2. `devapi::SearchReceiver` (or `CreateReceiverOnSerial`, `CreateReceiverOnUSB` with known
///     settings, or `OpenReceiver` for a port that is open already), which gives a handle;
///  3. any receiver function, in any order; `OpenFileList` before `GetFilesCount` and
///     `GetFileInfo`, and `CloseFileList` after them;
///  4. `devapi::CloseReceiver`, once for each handle that was obtained.
///
/// @par Handles
/// A receiver handle and a file list handle are opaque. Each function looks a handle up in a table
/// before it uses it, so an unknown or closed handle gives E_INVALIDARG and has no other effect.
///
/// @par Strings
/// Strings are UTF-16. Every string that the library hands out is a BSTR (allocated with
/// SysAllocString): the host frees it with SysFreeString. The host keeps the strings that it passes
/// in; they need to live only as long as the call.
///
/// @par Result codes
/// All `devapi` functions return a 32-bit HRESULT:
///
///     0x00000000 S_OK           success; a few operations also give it after a failure, and say so
///     0x00000001 S_FALSE        ended without a result, which is no error: nothing found, aborted,
///                               or other users of the receiver remain
///     0x80070057 E_INVALIDARG   a required pointer is null, a handle is unknown, an index is not
///                               below the count
///     0x8007000E E_OUTOFMEMORY  an allocation failed
///     0x80004001 E_NOTIMPL      this receiver's family does not offer the operation
///     0x80004005 E_FAIL         internal failure; a download of a file of size 0
///     0x8000FFFF E_UNEXPECTED   a value that `EInstanceType` does not have
///     0x8007048F                (ERROR_DEVICE_NOT_CONNECTED) no connection, no driver, no complete
///                               reply, or the receiver refused the command
///     0x800705B4                (ERROR_TIMEOUT) the receiver did not answer in time
///     0x8007xxxx                any other Win32 error, in the low 16 bits
///     0xExxxxxxx                an error of the USBIO driver, unchanged
///
/// @par Abort events
/// An abort event is a Win32 event that the host owns. Make it manual-reset: the first step that
/// looks at an auto-reset event clears it, and the steps after it do not see the abort.
///
/// @par Threads
/// Every function may be called from any thread, unless its comment says otherwise. Each call runs
/// on the caller's thread and returns when it has ended; the library starts no threads. Two threads
/// may use two receivers at once. Operations on one receiver wait for each other, except the port
/// settings of a Quorin receiver (`DCSetRcv...`). To keep other threads out during a series of
/// operations, call `LockConnection` before it and `UnlockConnection` after it. `Abort` is meant to
/// be called from another thread than the one that runs the operation.
///
/// @par How long a call takes
/// An operation first waits until those of other threads on the same receiver have ended; only the
/// functions with an abort event can give up that wait. Then a reply may take 30 s, and the answer
/// by which a receiver is recognised 8 s. After each answer of a Velmar receiver the library pauses
/// for 500 ms. When nothing answers:
///  - `SearchReceiver` and `SearchReceiverOnSerial` make 18 tries of 8 s for each family: about 5
///    minutes, or 2.5 minutes for one family. `CreateReceiverOnSerial` makes one such try, in 17 s
///    or less, and `CreateReceiverOnUSB` one of 8 s.
///  - `CheckConnection` takes 8 s, after an abort half a second more.
///  - `GetReceiverInfo`, `OpenFileList`, `DeleteFileW`, `RenameFile` and `DCSetRcv...` take 30 s.
///  - `DownloadFile` takes a minute when nothing answers from the beginning. When a receiver falls
///    silent during the transfer it takes 2 minutes over USB; with Velmar 30 s, and up to a minute
///    for the steps after it; with Quorin on a serial port it has no end.
///
/// A receiver that sends something else than the answer can make it a minute for each reply of a
/// Quorin receiver, and of a Velmar one as long as bytes come. A line that is held by flow control
/// makes it up to 3 s more for each command.
///
/// All other functions return at once, apart from `LockConnection`, which waits for the lock.
///
/// @par An unplugged cable
/// Without the cable of a serial port the line is silent. Searches give S_FALSE and
/// `CheckConnection` the answer 0. The operations on a Quorin receiver give 0x800705B4 once the
/// times above have passed, but a transfer that has begun has no end. Those on a Velmar receiver
/// look as if they had succeeded:
/// `OpenFileList` gives an empty list, `DownloadFile` S_OK and a part of the file, `DeleteFileW`,
/// `RenameFile` and `DCSetRcv...` S_OK; only `GetReceiverInfo` gives S_FALSE.
///
/// When a serial adapter or a USB device is unplugged, its driver fails every exchange from then
/// on, and the operations give its error: 0x8007xxxx, or 0xExxxxxxx of the USBIO driver.
/// `CheckConnection` answers 0. The receiver does not recover when the cable is plugged in again:
/// close it, and search. A search gives 0x80070002 for a COM port that is gone.
///
/// The functions that only use handles, locks, lists and the report work without the cable.
///
/// @par In the progress function
/// It runs inside `DownloadFile`, whose thread has locked the receiver. It may call `Abort`,
/// `CloseReceiver`, `OpenReceiver`, `GetFilesCount`, `GetFileInfo` and `DumpReportString`. Any
/// other operation on the same receiver would not wait, since its thread has the lock, and would
/// send its command into the transfer. Operations on other receivers are possible; two threads that
/// do so with each other's receivers wait without end.
///
/// @par In DllMain
/// Call no function of the library from a DllMain: the library may not be initialised yet, or be
/// unloaded already, and a call may wait for a thread that waits for the loader's lock.
///
/// @par Exceptions
/// The `devapi` functions return their failures; `GetFileInfo` alone raises a structured exception,
/// for a negative index. The functions of the report raise C++ exceptions for a wrong argument and
/// when no memory is left, see `DumpReportString`.
#ifndef RCVLINK_API_RCVLINK_H_
#define RCVLINK_API_RCVLINK_H_

#include <stddef.h>

/// Marks a function as imported from the DLL. A host does not define RCVLINK_STATIC: the library's
/// own build does, as it links the functions directly.
#ifdef RCVLINK_STATIC
#define RCVLINK_API
#else
#define RCVLINK_API __declspec(dllimport)
#endif

struct IStream;  // COM's stream (objidl.h)
struct _DCB;     // Win32's device control block (winbase.h)
class CIConnection;

#ifdef _MINWINBASE_
/// <windows.h> was included before: file times are records of its type.
typedef SYSTEMTIME RCVLINK_SYSTEMTIME;
#else
/// A record with the layout of Win32's SYSTEMTIME, for a host that does not include <windows.h>.
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

/// The family of receivers to ask for. Every other value behaves as `eProtocolAny`.
enum EProtocol {
  eProtocolAny = 0,     ///< Quorin first, then Velmar
  eProtocolQuorin = 1,  ///< Quorin only
  eProtocolVelmar = 2   ///< Velmar only
};

/// A receiver's identity, filled by `devapi::GetReceiverInfo`. 40 bytes.
struct CReceiverInfo {
  /// Mask of the file operations that the receiver's family offers: Quorin 9, Velmar 13. The value
  /// 4 stands for renaming; 1 and 8 are set in both families.
  unsigned int dwFeatures;
  unsigned int dwPadding;   ///< not written
  wchar_t* bstrReceiverId;  ///< BSTR, the receiver's id; the host frees it
  wchar_t* bstrReserved;    ///< never written; set it to null
  wchar_t* bstrModel;       ///< BSTR, the receiver's model; the host frees it
  unsigned int dwProtocol;  ///< 1 Quorin, 2 Velmar (the numbers of `EProtocol`)
  /// Variant of the family: Velmar 2; Quorin 2 when the model begins with "HVA3" or "HVB5", else 1.
  unsigned int dwVariant;
};

/// One entry of a file list. 56 bytes.
///
/// The times are in the zone of the receiver's clock, which no reply names. A Velmar receiver sends
/// date and time as they stand here; their wDayOfWeek is 0. A Quorin receiver sends seconds since
/// 1988-01-01, which the C runtime counts in this computer's zone. So the time here is an hour off
/// when that zone had daylight saving time on one of the two dates alone.
struct CFileInfo {
  unsigned int dwSize;            ///< size in bytes
  unsigned int dwPadding;         ///< zero
  wchar_t* bstrName;              ///< BSTR, the file's name on the receiver
  RCVLINK_SYSTEMTIME stTime1;     ///< the file's time as the receiver gives it; all 0: unknown
  RCVLINK_SYSTEMTIME stTime2;     ///< the same time: a receiver gives one time for a file
  unsigned long long qwReserved;  ///< zero
};

/// How a transfer reports its progress: `pfnProgress(pContext, percent)` with percent 0 to 100.
/// 16 bytes; the host owns it and keeps it alive until the transfer returns.
///
/// The function runs on the thread that runs the transfer, with a lock of the receiver held: it
/// must return quickly and must not throw. The beginning of this file says which functions it may
/// call. Two downloads of one receiver at once share one function, see `devapi::DownloadFile`.
struct CProgressCallback {
  void (*pfnProgress)(void* pContext, unsigned char percent);  ///< may be null
  void* pContext;                                              ///< passed to the function unchanged
};

// The layout of the records is part of the ABI: hosts of another compiler must agree on it.
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

/// @name Finding and closing receivers
/// @{

/// Finds the receiver on a port and registers it under the port's name.
///
/// A receiver already registered under that name is returned at once, with one more user counted.
/// Otherwise the link is searched. On a serial port there are up to 18 tries: RTS handshake, on and
/// off, and with each of them the port's current speed, then 9600, 115200, 57600, 38400 and 19200
/// bit/s. Each try opens the port again and asks the families that `protocol` names. On USB there
/// is one try, for Quorin only.
///
/// @param port       name of the COM port ("COM7"), or path of the USB device as for CreateFileW
/// @param type       the kind of link
/// @param protocol   the family to ask for
/// @param abortEvent Win32 event that the host owns. Once it is signalled the search ends at its
///                   next step. Null: the search cannot be aborted.
/// @param[in,out] receiver set *receiver to null before the call: the search reads it to learn
///                   whether one of its tries found a receiver. On success it holds the handle,
///                   which the host closes with `CloseReceiver`.
/// @retval S_OK         found; *receiver holds the handle
/// @retval S_FALSE      no receiver answered, or the search was aborted
/// @retval E_INVALIDARG `port` or `receiver` is null
/// @retval E_UNEXPECTED `type` is none of the three (and the name is not registered)
/// @return otherwise why the port could not be opened: 0x80070002 when it does not exist,
///         0x80070005 when another program has it. A USB device that cannot be opened gives
///         S_FALSE; one whose pipes cannot be used gives the error of the pipe. With `eInstanceAny`
///         the result is that of the USB device when the port has no receiver or cannot be opened.
/// @note Up to 5 minutes on a silent port, at once when it is registered. Without the cable:
/// S_FALSE. Not in the progress function.
RCVLINK_API long SearchReceiver(
    wchar_t* port, EInstanceType type, EProtocol protocol, void* abortEvent, void** receiver);

/// Makes one try on a serial port with settings that the host knows. Parameters as in
/// `SearchReceiver`. It does not look for a receiver that is registered already, so two calls make
/// two receivers where the port can be opened twice.
/// @param port     name of the COM port
/// @param protocol the family to ask for
/// @param settings Win32's DCB. Its baud rate in bit/s (0 keeps the port's speed), byte size,
///                 parity, stop bits and the flags fBinary, fParity, fOutxCtsFlow, fOutxDsrFlow,
///                 fDtrControl, fDsrSensitivity, fRtsControl and fAbortOnError are used. The host
///                 keeps it.
/// @param abortEvent   as in `SearchReceiver`
/// @param[out] receiver the handle
/// @retval S_OK          found; *receiver holds the handle
/// @retval S_FALSE       no receiver answered, or aborted
/// @retval E_INVALIDARG  `port`, `settings` or `receiver` is null
/// @retval E_OUTOFMEMORY an allocation failed
/// @return otherwise why the port could not be opened
/// @note Up to 17 s when nothing answers. Without the cable: S_FALSE. Not in the progress
/// function.
RCVLINK_API long CreateReceiverOnSerial(
    wchar_t* port, EProtocol protocol, _DCB* settings, void* abortEvent, void** receiver);

/// Makes one try on a USB device of the USBIO driver. It asks for a Quorin receiver whatever
/// `protocol` says, since no other family is reached over USB. Parameters as in `SearchReceiver`.
/// @param device path of the device, as CreateFileW takes it; no prefix is added
/// @param protocol not read
/// @param abortEvent   as in `SearchReceiver`
/// @param[out] receiver the handle
/// @retval S_OK          found; *receiver holds the handle
/// @retval S_FALSE       no receiver answered, the device could not be opened, its descriptors have
///                       another layout than those of the receivers, or aborted
/// @retval E_INVALIDARG  `device` or `receiver` is null
/// @retval E_OUTOFMEMORY an allocation failed
/// @return otherwise why the device's pipes could not be used: an HRESULT of a Win32 error, or one
///         of the USBIO driver's own errors (0xE.......)
/// @note Up to 8 s when nothing answers. Without the device: S_FALSE. Not in the progress
/// function.
RCVLINK_API long CreateReceiverOnUSB(wchar_t* device,
                                     EProtocol protocol,
                                     void* abortEvent,
                                     void** receiver);

/// Finds a receiver that is registered already and counts one more user of it.
/// @param port name under which it was registered; letter case counts
/// @param[out] receiver the handle
/// @retval S_OK         *receiver holds the handle, which the host closes with `CloseReceiver`
/// @retval S_FALSE      none of that name; *receiver is not changed
/// @retval E_INVALIDARG `receiver` is null
/// @note At once, also without the cable and in the progress function.
RCVLINK_API long OpenReceiver(wchar_t* port, void** receiver);

/// Removes one user of the receiver. When none is left, the receiver's operation is aborted, its
/// handle becomes unknown, and its port is closed. A call that still runs on another thread keeps
/// the receiver and its port open until it returns; `CloseReceiver` does not wait for it.
/// @param receiver handle
/// @retval S_OK         the receiver was removed
/// @retval S_FALSE      other users remain
/// @retval E_INVALIDARG unknown handle
/// @note At once, also without the cable and in the progress function.
RCVLINK_API long CloseReceiver(void* receiver);

/// Closes a receiver by its name, for a host that lost its handles. Each receiver of that name
/// loses one user, in no fixed order, until one of them has none left and is removed. An operation
/// that runs on that one is aborted; as with `CloseReceiver`, the call does not wait for it.
/// @param port name under which it was registered; letter case counts
/// @retval S_OK         a receiver was removed
/// @retval S_FALSE      none was removed
/// @retval E_INVALIDARG `port` is null
/// @note At once, also without the cable. Not in the progress function.
RCVLINK_API long DestroyReceiver(wchar_t* port);
/// @}

/// @name Operations on a receiver
/// All return E_INVALIDARG for an unknown handle and 0x8007048F when the receiver has no
/// connection, besides the results listed.
/// @{

/// Reads the receiver's identity: its id and model, and what its family offers.
/// @param receiver handle
/// @param abortEvent Win32 event that ends the wait for a receiver that another thread has locked;
///                   null: nothing ends that wait. The host owns it.
/// @param[out] info  filled on success. On failure `bstrReceiverId` and `bstrModel` are null.
/// @retval S_OK         the host frees `bstrReceiverId` and `bstrModel`
/// @retval S_FALSE      aborted, or the receiver answered with something else than its identity
/// @retval E_INVALIDARG `info` is null
/// @retval 0x800705B4   a Quorin receiver did not answer in time (a Velmar receiver: S_FALSE)
/// @retval 0x8007048F   a Quorin receiver refused (a Velmar receiver: S_FALSE)
/// @return otherwise the failure of the connection
/// @warning When a Quorin receiver's identity cannot be read, the calling thread still holds the
///          receiver's lock: call `UnlockConnection` after a result other than S_OK. A Velmar
///          receiver's lock is released also after a failure; a lock that the host took itself with
///          `LockConnection` stays, unless `abortEvent` is no valid handle.
/// @note Up to 30 s a reply. Without the cable: 0x800705B4, from a Velmar receiver S_FALSE. Not
/// in the progress function of the same receiver.
RCVLINK_API long GetReceiverInfo(void* receiver, void* abortEvent, CReceiverInfo* info);

/// Asks whether the receiver still answers.
/// @param receiver handle
/// @param abortEvent Win32 event that ends the check, and the wait for a receiver that another
///                   thread has locked. Null: only `Abort` ends the check, and nothing ends that
///                   wait.
/// @param[out] answer -1 (VARIANT_TRUE) when it answered, 0 when not
/// @retval S_OK         checked; `answer` is set (to 0 when the check was aborted)
/// @retval S_FALSE      aborted while another thread held the receiver; `answer` is not written
/// @retval E_INVALIDARG `answer` is null
/// @return otherwise the Win32 error of the wait for the lock, as `LockConnection`
/// @note Up to 8 s. Without the cable: S_OK and the answer 0. Not in the progress function of the
/// same receiver.
RCVLINK_API long CheckConnection(void* receiver, void* abortEvent, short* answer);

/// Locks the receiver for the calling thread until `UnlockConnection`. The lock counts: the same
/// thread releases it as often as it took it.
/// @param receiver handle
/// @param abortEvent Win32 event that ends the wait; null: wait without limit
/// @retval S_OK    the calling thread holds the receiver
/// @retval S_FALSE the event was signalled first
/// @return otherwise the Win32 error of the wait. When a thread ended while it held the lock, the
///         next call gives the last error of the calling thread, and yet takes the lock: call
///         `UnlockConnection`.
/// @note Waits for the other threads. It works without the cable. Not in the progress function of
/// the same receiver.
RCVLINK_API long LockConnection(void* receiver, void* abortEvent);

/// Releases the lock once.
/// @param receiver handle
/// @retval S_OK also when the calling thread did not hold it
/// @note At once, also without the cable. Not in the progress function of the same receiver.
RCVLINK_API long UnlockConnection(void* receiver);

/// Ends the operation that another thread runs on the receiver: its wait ends at once, and the
/// operation at its next step. It does not wait for the receiver's lock, so it works while an
/// operation holds it.
///
/// When no operation runs, the abort ends the next one. An operation of a Quorin receiver then
/// gives S_FALSE before it sends anything, or, when its first command asks for the receiver's
/// identity or port, after that command. An operation of a Velmar receiver sends its first command
/// and then gives S_FALSE. A `CheckConnection` answers 0 once.
///
/// `CheckConnection` and the download of a Velmar receiver end too, but do not clear the abort: the
/// next operation other than these two ends with S_FALSE as well.
/// @param receiver handle
/// @retval S_OK for every known handle
/// @note At once, also without the cable and in the progress function.
RCVLINK_API long Abort(void* receiver);

/// Copies a file of the receiver into a stream.
/// @param receiver handle
/// @param name     name as in the file list; it is sent in the thread's ANSI code page
/// @param stream   COM stream that the host owns. Its Write is called on the calling thread; with a
///                 Velmar receiver also AddRef before the transfer and Release after it.
/// @param progress may be null. It takes effect before the wait for another operation: while two
///                 threads download from one receiver, the function of the later call gets the
///                 percents of both, and none gets any once the first has ended.
/// @retval S_OK         finished, or failed: compare the byte count with the size in the file list.
///                      A Quorin receiver on a serial port gives it also when the stream's Write
///                      failed. A Velmar receiver gives it also for a file that it does not have
///                      (nothing is written then), after it fell silent, and, when the download
///                      raised the speed, after any failure of the transfer.
/// @retval S_FALSE      aborted, or ended by the receiver
/// @retval E_INVALIDARG `name` or `stream` is null
/// @retval E_FAIL       a Quorin receiver says that the file's size is 0, or does not say it
/// @retval 0x800705B4   a Quorin receiver did not answer in time
/// @retval 0x8007048F   a Quorin receiver refused a command, or sent a block of an invalid length
/// @return otherwise the failure of the connection, or over USB that of the stream's Write
/// @note The checksums of a Velmar receiver's file are not compared: a byte that was damaged on the
///       line is in the stream, and the result is S_OK. Where it matters, download twice and
///       compare. The checksums of Quorin blocks are compared.
/// @note A Quorin receiver on a serial port that falls silent between two blocks is asked again
///       until the host calls `Abort`: Windows ends such a read as a success of 0 bytes, not as a
///       time-out.
/// @note Quorin blocks are numbered with 16 bits: the download of a file of more than 65536 blocks
///       of 512 bytes (33554432 bytes) does not finish; over USB it ends with 0x800705B4.
/// @note As long as the line needs; 30 s a reply. Without the cable: 0x800705B4, from a Velmar
/// receiver S_OK and a part of the file, and a Quorin receiver on a serial port is asked until
/// `Abort`. Not in the progress function of the same receiver.
RCVLINK_API long DownloadFile(void* receiver,
                              wchar_t* name,
                              IStream* stream,
                              CProgressCallback* progress);

/// Reserved: no family of receivers takes files.
/// @param receiver handle
/// @param info     not read
/// @param stream   not read
/// @param progress not called
/// @retval E_NOTIMPL for every known handle
/// @note At once, also without the cable. Not in the progress function of the same receiver.
RCVLINK_API long UploadFile(void* receiver,
                            const CFileInfo* info,
                            IStream* stream,
                            CProgressCallback* progress);

/// Deletes a file of the receiver.
/// @param receiver handle
/// @param name name as in the file list; it is sent in the thread's ANSI code page
/// @retval S_OK         a Quorin receiver deleted it. A Velmar receiver gives it also when it
///                      refused or did not answer: to be certain, read the file list again.
/// @retval S_FALSE      aborted; the receiver may have deleted the file all the same
/// @retval E_INVALIDARG `name` is null
/// @retval 0x8007048F   a Quorin receiver refused
/// @retval 0x800705B4   a Quorin receiver did not answer in time
/// @return otherwise the failure of the connection
/// @note Up to 30 s. Without the cable: 0x800705B4, from a Velmar receiver S_OK. Not in the
/// progress function of the same receiver.
RCVLINK_API long DeleteFileW(void* receiver, wchar_t* name);

/// Renames a file of a Velmar receiver. Names are sent in the thread's ANSI code page.
/// @param receiver handle
/// @param oldName name as in the file list
/// @param newName name that the file gets
/// @retval S_OK         renamed, refused, or not answered, as with `DeleteFileW`
/// @retval S_FALSE      aborted; the receiver may have renamed the file all the same
/// @retval E_INVALIDARG a name is null
/// @retval E_NOTIMPL    a Quorin receiver, with any names: its family does not rename
/// @return otherwise the failure of the connection
/// @note Up to 30 s. Without the cable: S_OK. Not in the progress function of the same receiver.
RCVLINK_API long RenameFile(void* receiver, wchar_t* oldName, wchar_t* newName);
/// @}

/// @name Settings of the receiver's own serial port
/// They change the receiver's port, not the host's, and do not say whether the receiver took the
/// setting. They do not lock a Quorin receiver: when other threads use it, call `LockConnection`
/// before.
///
/// Results: S_OK the setting was sent, or a Velmar receiver did not give its port's settings and
/// nothing was sent; S_FALSE aborted, or a Quorin receiver did not name its port; 0x800705B4 a
/// Quorin receiver did not answer in time; 0x8007048F a Quorin receiver refused to name its port;
/// otherwise the failure of the connection.
/// @{

/// Sets the speed.
/// @param receiver handle
/// @param baudRate bits per second
/// @return one of the results above
/// @note Up to 30 s. Without the cable: 0x800705B4, from a Velmar receiver S_OK. Not in the
/// progress function of the same receiver.
RCVLINK_API long DCSetRcvBaudrate(void* receiver, unsigned long baudRate);

/// Sets the parity. The two families number it differently.
/// @param receiver handle
/// @param parity Quorin: 1 odd, 2 even. Velmar: 1 even, 2 odd. Any other value: none.
/// @return one of the results above
/// @note As `DCSetRcvBaudrate`. Not in the progress function of the same receiver.
RCVLINK_API long DCSetRcvParity(void* receiver, unsigned char parity);

/// Sets the RTS line.
/// @param receiver handle
/// @param rts 0 off, any other value on
/// @retval E_NOTIMPL a Velmar receiver: its family does not control the line
/// @return otherwise one of the results above
/// @note Up to 30 s. Without the cable: 0x800705B4. Not in the progress function of the same
/// receiver.
RCVLINK_API long DCSetRcvRTSControl(void* receiver, unsigned char rts);

/// Sets the number of stop bits.
/// @param receiver handle
/// @param stopBits Quorin: 0 for one stop bit, any other value for two. Velmar: their number.
/// @return one of the results above
/// @note As `DCSetRcvBaudrate`. Not in the progress function of the same receiver.
RCVLINK_API long DCSetRcvStopbits(void* receiver, unsigned char stopBits);
/// @}

/// @name File lists
/// A file list is a copy of the receiver's directory: it stays readable after the receiver was
/// closed. The table of file lists has no lock: do not call these functions from two threads at
/// once.
/// @{

/// Reads the receiver's directory.
/// @param receiver handle
/// @param[out] fileList the list's handle, which the host closes with `CloseFileList`
/// @retval S_OK          read
/// @retval E_INVALIDARG  `fileList` is null, or the receiver's handle is unknown
/// @retval E_OUTOFMEMORY an allocation failed
/// @retval S_FALSE       aborted; the list is empty, and has to be closed
/// @retval 0x8007048F    a Quorin receiver refused, or its answer did not become complete
/// @retval 0x800705B4    a Quorin receiver did not answer in time
/// @return otherwise the failure of the connection. A failure (negative) makes no list.
/// @note A Velmar receiver's directory is read through a buffer of 8192 bytes, which holds about 70
///       files: of a longer directory the list has the first part. A receiver that does not answer
///       gives an empty list.
/// @note Up to 30 s. Without the cable: 0x800705B4, from a Velmar receiver an empty list. Not in
/// the progress function of the same receiver.
RCVLINK_API long OpenFileList(void* receiver, void** fileList);

/// Counts the entries of a file list.
/// @param fileList handle of the list
/// @param[out] count number of files
/// @retval S_OK         `count` is set
/// @retval E_INVALIDARG unknown list, or `count` is null
/// @note At once, also without the cable and in the progress function.
RCVLINK_API long GetFilesCount(void* fileList, long* count);

/// Copies one entry.
/// @param fileList handle of the list
/// @param index 0 to count - 1. A negative index is a programming error: it raises the structured
///              exception EXCEPTION_ARRAY_BOUNDS_EXCEEDED (0xC000008C).
/// @param[out] info the entry; `bstrName` is a copy that the host frees
/// @retval S_OK          `info` is filled
/// @retval E_INVALIDARG  unknown list, `info` is null, or `index` is not below the count
/// @retval E_OUTOFMEMORY the name could not be copied; `bstrName` is null
/// @note At once, also without the cable and in the progress function.
RCVLINK_API long GetFileInfo(void* fileList, long index, CFileInfo* info);

/// Frees a file list. Copies that `GetFileInfo` gave stay the host's.
/// @param fileList handle of the list
/// @retval S_OK         the handle is unknown from now on
/// @retval E_INVALIDARG unknown list
/// @note At once, also without the cable. Not in the progress function.
RCVLINK_API long CloseFileList(void* fileList);
/// @}

}  // namespace devapi

/// The report file: a plain text trace of the library, one line with a time stamp for each event.
/// It is a hidden file in the user's temporary folder. The host may write its own lines into it.
namespace dump_hlp {

/// Starts a report. A report that is open is closed first, and a file of that name is overwritten.
/// When the file cannot be created, or its path does not fit into 260 characters, reporting is off;
/// the call does not say so.
/// @param name file name without a folder, in the thread's ANSI code page; the file is made in the
///             folder of GetTempPath
/// @warning Do not call it while another thread is inside the library: it takes no lock. A name
///          that is null or cannot be converted raises a C++ exception, see `DumpReportString`.
/// @note At once. Not while another thread is inside the library.
RCVLINK_API void CreateReportFile(const char* name);
/// The same with a wide name.
/// @param name file name without a folder; null only closes the report that is open
/// @note At once. Not while another thread is inside the library.
RCVLINK_API void CreateReportFile(const wchar_t* name);

/// Writes one entry with a time stamp. No line end is added: end the text in "\r\n". Without a
/// report nothing is written. Any thread may call it.
/// @warning A null format, an invalid one, and a lack of memory raise a C++ exception of the
///          library's own runtime, which a host of another compiler cannot catch.
/// @param format    format of Microsoft's printf
/// @param arguments the va_list of the caller
/// @note At once, also in the progress function.
RCVLINK_API void DumpReportString(const char* format, char* arguments);
/// The same with a wide format.
/// @param format    format of Microsoft's printf
/// @param arguments the va_list of the caller
/// @note At once, also in the progress function.
RCVLINK_API void DumpReportString(const wchar_t* format, char* arguments);

/// Closes the report; without one it does nothing.
/// @warning Do not call it while another thread is inside the library: it takes no lock.
/// @note At once. Not while another thread is inside the library.
RCVLINK_API void CloseReportFile();

}  // namespace dump_hlp

/// The search of `devapi::SearchReceiver` on a serial port, without the look for a registered
/// receiver. Results as there.
/// @param port       name of the COM port
/// @param protocol   the family to ask for
/// @param abortEvent may be null
/// @param[in,out] receiver set *receiver to null before the call
/// @return as `SearchReceiver` with `eInstanceSerial`
/// @note Up to 5 minutes on a silent port. Without the cable: S_FALSE. Not in the progress
/// function.
RCVLINK_API long SearchReceiverOnSerial(wchar_t* port,
                                        EProtocol protocol,
                                        void* abortEvent,
                                        void** receiver);

/// Reserved: a host does not get at connections.
/// @param name not read
/// @param type not read
/// @param connection not written
/// @retval E_NOTIMPL always
/// @note At once. Not in the progress function.
RCVLINK_API long GetConnection(wchar_t* name, EInstanceType type, CIConnection** connection);

#endif  // RCVLINK_API_RCVLINK_H_
