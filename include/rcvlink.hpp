/// @file rcvlink.hpp
/// rcvlink for hosts in C++20: owners, plain values and exceptions over rcvlink.h. Header only; link as
/// with rcvlink.h, and with oleaut32. It includes <windows.h>.
///
///     auto receiver = rcvlink::Receiver::Find(L"COM7");
///     for (const rcvlink::File& file : receiver.Files()) {
///       receiver.Download(file, L"D:\\survey\\" + file.name);
///     }
///
/// @par Errors
/// A failure is a std::system_error. Its code is of `rcvlink::Category()`: the HRESULT of the library or
/// of Windows. `Error` has the codes that a host may want to tell apart; many also compare equal to a
/// std::errc (`error.code() == std::errc::timed_out`). what() is UTF-8 and says what was tried and why it
/// failed. Some failures that the library does not report are found here: a download whose byte count is
/// not the size that was listed, a deletion or renaming that a Velmar receiver refused, an empty list of
/// a Velmar receiver that does not answer, a receiver that falls silent in a download.
///
/// @par Cancelling
/// What may take long takes a std::stop_token. When a stop is requested the call ends soon and throws
/// Error::kCancelled, and the receiver can be used again. A receiver that has to be sent its old speed
/// first may take some seconds. A call that a stop can end has a second thread while it runs.
///
/// @par Threads
/// Each call runs on the caller's thread. Calls to one receiver from several threads wait for each
/// other. Several receivers work at once, but their file lists are read one after the other.
#ifndef RCVLINK_RCVLINK_HPP_
#define RCVLINK_RCVLINK_HPP_

#include <windows.h>

#include <objidl.h>
#include <oleauto.h>

#include <algorithm>
#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <cstdint>
#include <exception>
#include <filesystem>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <span>
#include <stop_token>
#include <string>
#include <string_view>
#include <system_error>
#include <thread>
#include <utility>
#include <vector>

#include "rcvlink.h"

namespace rcvlink {

/// Codes that a host may want to tell apart. Any other HRESULT may be thrown as well.
enum class Error : int {
  /// S_FALSE: no receiver answered, or the receiver ended the operation without a result
  kNoResult = 1,
  /// the family of the receiver does not offer the operation
  kNotOffered = static_cast<int>(0x80004001U),
  /// there is no such port, or the receiver lists no file of that name
  kNotFound = static_cast<int>(0x80070002U),
  /// the byte count of a download is not the size that the receiver lists
  kOtherSize = static_cast<int>(0x8007000DU),
  /// the file has more bytes than its protocol can send
  kTooLarge = static_cast<int>(0x800700DFU),
  /// the receiver refused, its reply was damaged, or the connection is lost
  kRefusedOrLost = static_cast<int>(0x8007048FU),
  /// a stop was requested
  kCancelled = static_cast<int>(0x800704C7U),
  /// the receiver did not answer in time
  kTimedOut = static_cast<int>(0x800705B4U),
};

/// The category of the HRESULTs of the library and of Windows. Its messages are English, except those
/// of Windows for codes that only Windows gives.
/// @return the one object of the category
const std::error_category& Category() noexcept;

/// Makes `Error` a code of `Category()`, for comparisons such as `error.code() == Error::kTimedOut`.
/// @param error one of the codes
/// @return the code with its category
inline std::error_code make_error_code(Error error) noexcept {
  return {static_cast<int>(error), Category()};
}

}  // namespace rcvlink

/// @cond
// Lets a std::error_code be made of, and compared with, a rcvlink::Error.
template <>
struct std::is_error_code_enum<rcvlink::Error> : std::true_type {};
/// @endcond

namespace rcvlink {

/// A string of the library, freed in the end: for hosts that call `devapi` functions themselves.
struct StringFreer {
  /// @param string of the library, or null
  void operator()(wchar_t* string) const noexcept { SysFreeString(string); }  ///< frees it
};
using UniqueString = std::unique_ptr<wchar_t, StringFreer>;  ///< owns a string of the library

/// A file list of the library, closed in the end: for hosts that call `devapi` functions themselves.
struct FileListCloser {
  /// @param list of `devapi::OpenFileList`
  void operator()(void* list) const noexcept { devapi::CloseFileList(list); }  ///< closes it
};
using UniqueFileList = std::unique_ptr<void, FileListCloser>;  ///< owns a file list

/// A receiver's identity.
struct Identity {
  std::wstring id{};                ///< the receiver's id
  std::wstring model{};             ///< its model
  EProtocol family = eProtocolAny;  ///< its family
  unsigned variant = 0;             ///< the variant of the family, as `CReceiverInfo::dwVariant`
  unsigned features = 0;            ///< a mask, as `CReceiverInfo::dwFeatures`
};

/// A file of a receiver.
struct File {
  /// Time by the receiver's clock, whose zone the receiver does not tell.
  using Time = std::chrono::local_time<std::chrono::milliseconds>;

  std::wstring name{};         ///< the name on the receiver; it need not be one that Windows allows
  std::uint64_t size = 0;      ///< in bytes
  std::optional<Time> time{};  ///< of the last change; nothing: unknown
};

/// Takes the bytes of a download, in order. The span is valid during the call. It may throw: the
/// download then ends, and throws the same exception. It runs on the thread of the download with the
/// receiver locked: it must not start another operation of that receiver.
using Sink = std::function<void(std::span<const std::byte> bytes)>;

/// Called with 0 to 100 as a download proceeds. The same rules as for `Sink`.
using Progress = std::function<void(int percent)>;

/// How to search.
struct SearchOptions {
  EProtocol family = eProtocolAny;  ///< the family to ask for
  std::stop_token stop{};           ///< ends the search
};

/// How to download.
struct DownloadOptions {
  Progress progress{};     ///< may be empty
  std::stop_token stop{};  ///< ends the download
  /// Ends the download with Error::kTimedOut when no byte has come for so long; the time spent in the
  /// sink does not count. 0: never. Without it, a Quorin receiver that has fallen silent is asked again
  /// for ever. The library's own limits are 30 s.
  std::chrono::milliseconds silence = std::chrono::seconds(45);
  /// Gives a downloaded file the receiver's time, taken as UTC. An unknown time is not set.
  bool set_time = false;
};

/// The parity of a receiver's port.
enum class Parity { kNone, kOdd, kEven };

class Receiver;

/// Holds a receiver for the calling thread, over several operations. Release it on the same thread,
/// before the receiver is closed. A thread may hold several.
class Lock {
 public:
  /// Waits until no other thread holds the receiver, without limit unless `stop` ends it.
  /// @param receiver is held; it must live longer than this
  /// @param stop ends the wait
  /// @throws std::system_error Error::kCancelled; the Win32 error of the wait
  explicit Lock(const Receiver& receiver, const std::stop_token& stop = {});

 private:
  struct Unlocker {
    void operator()(void* receiver) const noexcept { devapi::UnlockConnection(receiver); }
  };
  std::unique_ptr<void, Unlocker> receiver_;
};

/// A receiver, closed in the end. It can be moved, but not while another thread uses it. All functions
/// may throw std::bad_alloc and, as std::system_error, any result of the function of rcvlink.h besides
/// those that are listed. A command that is not answered takes up to 30 s.
class Receiver {
 public:
  /// Finds the receiver on a port, as `devapi::SearchReceiver`: one that is open already at once,
  /// otherwise in seconds; on a silent port minutes pass.
  /// @param port such as L"COM7", or the path of a USB device, which begins with two backslashes
  /// @param options family, stop
  /// @throws std::system_error Error::kNoResult when no receiver answers; Error::kNotFound when there
  ///         is no such port; std::errc::permission_denied when another program has it;
  ///         Error::kCancelled
  /// @return the receiver
  static Receiver Find(std::wstring port, const SearchOptions& options = {});

  /// Makes one try with known settings, as `devapi::CreateReceiverOnSerial`. It takes seconds.
  /// @param port    such as L"COM7"
  /// @param settings of the port
  /// @param options family, stop
  /// @throws std::system_error as `Find`
  /// @return the receiver
  static Receiver FindAt(std::wstring port, DCB settings, const SearchOptions& options = {});

  /// Takes over a handle of `devapi` functions, such as that of `devapi::OpenReceiver`.
  /// @param handle is closed with this object
  explicit Receiver(void* handle) noexcept : handle_(handle) {}

  /// For `devapi` functions.
  /// @return the handle, which is closed with this object; null after a move
  void* handle() const noexcept { return handle_.get(); }

  /// The receiver's family, known without asking the receiver.
  /// @return eProtocolQuorin or eProtocolVelmar
  EProtocol Family() const noexcept;

  /// Reads the receiver's identity: one or two commands. After a failure the receiver is not locked.
  /// @param stop ends it
  /// @return the identity
  /// @throws std::system_error Error::kNoResult when it answers with something else;
  ///         Error::kRefusedOrLost; Error::kTimedOut; Error::kCancelled
  Identity Identify(const std::stop_token& stop = {});

  /// Asks whether the receiver still answers: one command.
  /// @param stop ends it
  /// @return whether it does
  /// @throws std::system_error Error::kCancelled
  bool Answers(const std::stop_token& stop = {});

  /// Reads the receiver's directory; seconds at a low speed.
  ///
  /// Of a Velmar receiver's directory only the first 8192 bytes are read, about 70 files. When the list
  /// may be longer than that, the end of it is waited for, up to two minutes. An empty list is read
  /// twice, since a refusal and a lost reply look the same; a minute may pass. One that was refused twice
  /// cannot be told from a receiver without files.
  /// @param stop ends it
  /// @return the files, in the receiver's order
  /// @throws std::system_error Error::kTimedOut when it does not answer; Error::kRefusedOrLost;
  ///         Error::kCancelled
  std::vector<File> Files(const std::stop_token& stop = {});

  /// Reads the directory and looks for a file.
  /// @param name its name; letter case counts
  /// @param stop ends it
  /// @return the file
  /// @throws std::system_error Error::kNotFound when the receiver lists none; as `Files`
  File FindFile(const std::wstring& name, const std::stop_token& stop = {});

  /// Downloads a file into a function. It takes as long as the line needs: at least 90 s for a MB at
  /// 115200 bit/s.
  ///
  /// The sink never gets more bytes than were listed. It gets them before it is known whether all come:
  /// keep them only when the call returns. An empty file is not asked for, as no protocol sends one.
  /// Of a Velmar receiver's file the checksums are not compared: where it matters, download twice.
  /// @param file    as listed; only its name and size count
  /// @param sink    gets the bytes
  /// @param options progress, stop, silence
  /// @throws std::system_error Error::kOtherSize when more or fewer bytes came than were listed, also
  ///         when a Velmar receiver does not have the file or falls silent; Error::kTooLarge for more
  ///         than 33554432 bytes of a Quorin receiver; Error::kNoResult when the receiver ended it;
  ///         Error::kRefusedOrLost; Error::kTimedOut; Error::kCancelled
  /// @throws any exception of the sink or of the progress function, unchanged
  void Download(const File& file, const Sink& sink, const DownloadOptions& options = {});

  /// Downloads a file into a file of this computer. The bytes go into one with ".part" after its name,
  /// which replaces `target` when all have come; until then an existing `target` is not changed. After a
  /// failure the ".part" file is deleted. It is kept only when it is complete and could not be renamed.
  /// An older ".part" file is replaced.
  /// @param file    as listed
  /// @param target  path of the new file; a name of the receiver may be one that leads elsewhere
  /// @param options progress, stop, silence, set_time
  /// @throws as the other `Download`; std::system_error with the Win32 error when the file cannot be
  ///         written or renamed
  void Download(const File& file,
                const std::filesystem::path& target,
                const DownloadOptions& options = {});

  /// Deletes a file of the receiver. Of a Velmar receiver the directory is read afterwards, since it does
  /// not report a refusal; that the file never existed is no failure then, nor one beyond the part of the
  /// directory that can be read.
  /// @param name of the file
  /// @param stop ends it
  /// @throws std::system_error Error::kRefusedOrLost when the receiver refused; Error::kTimedOut;
  ///         Error::kCancelled: it may be deleted all the same
  void Delete(const std::wstring& name, const std::stop_token& stop = {});

  /// Renames a file of a Velmar receiver, and reads the directory afterwards, as `Delete`.
  /// @param from its name
  /// @param to   its new name
  /// @param stop ends it
  /// @throws std::system_error Error::kNotOffered for a Quorin receiver; Error::kRefusedOrLost when the
  ///         directory does not show the change; Error::kTimedOut; Error::kCancelled: it may be renamed
  ///         all the same
  void Rename(const std::wstring& from, const std::wstring& to, const std::stop_token& stop = {});

  /// @name Settings of the receiver's own port
  /// They change the receiver's side of the line and not the host's: close the receiver then, and find
  /// it again. It is not known whether the receiver took a setting.
  /// @{

  /// Sets the speed.
  /// @param bits_per_second such as 115200
  void SetBaudRate(unsigned long bits_per_second);
  /// Sets the parity.
  /// @param parity none, odd or even
  void SetParity(Parity parity);
  /// Sets the number of stop bits.
  /// @param count 1 or 2
  void SetStopBits(int count);
  /// Sets the RTS line.
  /// @param on whether it is on
  /// @throws std::system_error Error::kNotOffered for a Velmar receiver
  void SetRts(bool on);
  /// @}

 private:
  struct Activity;
  class Watch;
  class Transfer;
  class PartFile;

  template <typename Operation>
  long Run(const std::stop_token& stop, Operation operation, Activity* activity = nullptr);
  template <typename Operation>
  void Execute(const char* tried, const std::stop_token& stop, Operation operation);
  std::vector<File> ReadDirectory(const std::stop_token& stop);
  void AwaitEndOfList(const std::stop_token& stop);

  struct Closer {
    void operator()(void* handle) const noexcept { devapi::CloseReceiver(handle); }
  };
  std::unique_ptr<void, Closer> handle_;
  // An abort may outlive the operation that it was meant for, and then ends the next one. Guarded by
  // the receiver's lock.
  bool abort_left_ = false;
};

/// The report of the process, a trace of the library in the folder of GetTempPath. Make and destroy it
/// while no other thread is inside the library.
class Report {
 public:
  /// Starts the report, or does nothing when the file cannot be made.
  /// @param name file name without a folder
  explicit Report(const std::wstring& name) { dump_hlp::CreateReportFile(name.c_str()); }
  Report(const Report&) = delete;
  Report& operator=(const Report&) = delete;
  ~Report() { dump_hlp::CloseReportFile(); }

  /// Writes a line of the host. Any thread may call it.
  /// @param line its text, without a line end
  void Write(std::wstring_view line);
};

// --- What follows is no part of the interface.
/// @cond

namespace detail {

class HresultCategory final : public std::error_category {
 public:
  const char* name() const noexcept override { return "rcvlink"; }

  std::string message(int code) const override {
    switch (code) {
      case S_OK:
        return "done";
      case S_FALSE:
        return "no result: nothing found, aborted, or ended by the receiver";
      case E_INVALIDARG:
        return "invalid argument";
      case E_OUTOFMEMORY:
      case HRESULT_FROM_WIN32(ERROR_NOT_ENOUGH_MEMORY):
        return "this computer is out of memory";
      case E_NOTIMPL:
        return "not supported by this receiver's family";
      case E_FAIL:
        return "internal failure, or the receiver says that the file is empty";
      case E_UNEXPECTED:
        return "unexpected kind of link";
      case HRESULT_FROM_WIN32(ERROR_DEVICE_NOT_CONNECTED):
        return "no connection, no driver, no complete reply, or the receiver refused the command";
      case HRESULT_FROM_WIN32(ERROR_TIMEOUT):
        return "the receiver did not answer in time";
      case HRESULT_FROM_WIN32(ERROR_FILE_NOT_FOUND):
        return "it does not exist";
      case HRESULT_FROM_WIN32(ERROR_PATH_NOT_FOUND):
        return "there is no such folder";
      case HRESULT_FROM_WIN32(ERROR_ACCESS_DENIED):
        return "access denied: in use, or not allowed";
      case HRESULT_FROM_WIN32(ERROR_SHARING_VIOLATION):
        return "in use by another program or thread";
      case HRESULT_FROM_WIN32(ERROR_INVALID_DATA):
        return "the byte count is not the size that the receiver lists";
      case HRESULT_FROM_WIN32(ERROR_NOT_READY):
        return "the device does not answer: switched off or out of reach";
      case HRESULT_FROM_WIN32(ERROR_DISK_FULL):
        return "the disk is full";
      case HRESULT_FROM_WIN32(ERROR_FILE_TOO_LARGE):
        return "a Quorin receiver can send at most 33554432 bytes of a file";
      case HRESULT_FROM_WIN32(ERROR_CANCELLED):
        return "cancelled";
      default:
        return OtherMessage(static_cast<unsigned>(code));
    }
  }

  std::error_condition default_error_condition(int code) const noexcept override {
    switch (code) {
      case E_INVALIDARG:
        return std::errc::invalid_argument;
      case E_OUTOFMEMORY:
      case HRESULT_FROM_WIN32(ERROR_NOT_ENOUGH_MEMORY):
        return std::errc::not_enough_memory;
      case E_NOTIMPL:
        return std::errc::not_supported;
      case HRESULT_FROM_WIN32(ERROR_TIMEOUT):
        return std::errc::timed_out;
      case HRESULT_FROM_WIN32(ERROR_FILE_NOT_FOUND):
      case HRESULT_FROM_WIN32(ERROR_PATH_NOT_FOUND):
        return std::errc::no_such_file_or_directory;
      case HRESULT_FROM_WIN32(ERROR_ACCESS_DENIED):
      case HRESULT_FROM_WIN32(ERROR_SHARING_VIOLATION):
        return std::errc::permission_denied;
      case HRESULT_FROM_WIN32(ERROR_DISK_FULL):
        return std::errc::no_space_on_device;
      case HRESULT_FROM_WIN32(ERROR_FILE_TOO_LARGE):
        return std::errc::file_too_large;
      case HRESULT_FROM_WIN32(ERROR_CANCELLED):
        return std::errc::operation_canceled;
      default:
        return {code, *this};
    }
  }

 private:
  static std::string OtherMessage(unsigned code) {
    constexpr unsigned kHighHalf = 0xFFFF0000U;
    constexpr unsigned kWin32 = 0x80070000U;
    constexpr unsigned kFamily = 0xF0000000U;
    constexpr unsigned kUsbio = 0xE0000000U;
    constexpr int kDigits = 8;
    constexpr int kBitsOfDigit = 4;
    std::string text = "0x";
    for (int digit = kDigits; digit-- > 0;) {
      text += "0123456789ABCDEF"[code >> (digit * kBitsOfDigit) & 0xF];
    }
    if ((code & kFamily) == kUsbio) return text + ", an error of the USBIO driver";
    char* system_text = nullptr;
    const DWORD length = FormatMessageA(
        FORMAT_MESSAGE_ALLOCATE_BUFFER | FORMAT_MESSAGE_FROM_SYSTEM | FORMAT_MESSAGE_IGNORE_INSERTS,
        nullptr,
        (code & kHighHalf) == kWin32 ? code & ~kHighHalf : code,
        0,
        reinterpret_cast<char*>(&system_text),
        0,
        nullptr);
    const std::unique_ptr<char, decltype(&LocalFree)> owner(system_text, &LocalFree);
    std::string_view words(system_text, length);
    words = words.substr(0, words.find_last_not_of("\r\n. ") + 1);
    return words.empty() ? text : (text + ", ").append(words);
  }
};

inline std::string Utf8(std::wstring_view text) {
  const int units = static_cast<int>(text.size());
  const int size =
      WideCharToMultiByte(CP_UTF8, 0, text.data(), units, nullptr, 0, nullptr, nullptr);
  std::string utf8(static_cast<std::size_t>(size), '\0');
  WideCharToMultiByte(CP_UTF8, 0, text.data(), units, utf8.data(), size, nullptr, nullptr);
  return utf8;
}

[[noreturn]] inline void Throw(long result, const std::string& tried) {
  throw std::system_error(static_cast<int>(result), Category(), tried);
}
[[noreturn]] inline void Throw(Error error, const std::string& tried) {
  throw std::system_error(error, tried);
}
[[noreturn]] inline void ThrowWin32(DWORD error, const std::string& tried) {
  Throw(HRESULT_FROM_WIN32(error), tried);
}

inline void ThrowIfStopped(const std::stop_token& stop, const std::string& tried) {
  if (stop.stop_requested()) Throw(Error::kCancelled, tried);
}

// A result that is no success becomes an exception.
inline void Check(long result, const std::stop_token& stop, const std::string& tried) {
  if (result == S_OK) return;
  ThrowIfStopped(stop, tried);
  Throw(result, tried);
}

inline std::wstring Take(wchar_t* string) {
  const UniqueString owner(string);
  return {string, SysStringLen(string)};
}

struct HandleCloser {
  using pointer = HANDLE;
  void operator()(HANDLE handle) const noexcept {
    if (handle != INVALID_HANDLE_VALUE) CloseHandle(handle);
  }
};
using UniqueHandle = std::unique_ptr<HANDLE, HandleCloser>;

// How often a stop is looked for.
inline constexpr std::chrono::milliseconds kPoll{50};

inline HANDLE MakeEvent() {
  const HANDLE event = CreateEventW(nullptr, TRUE, FALSE, nullptr);
  if (event == nullptr) ThrowWin32(GetLastError(), "make an event");
  return event;
}

// Calls a function on a thread of its own, at once and again after each kPoll, until it is destroyed.
// Whether a stop is requested is asked in this way. In GNU's library for Windows a std::stop_callback
// that is destroyed at the moment of the request may wait for ever, and so may a wait that takes a token.
class Ticker {
 public:
  explicit Ticker(std::function<void()> tick)
      : end_(MakeEvent()), thread_([end = end_.get(), tick = std::move(tick)] {
          do {
            tick();
          } while (WaitForSingleObject(end, DWORD{kPoll.count()}) == WAIT_TIMEOUT);
        }) {}
  Ticker(const Ticker&) = delete;
  Ticker& operator=(const Ticker&) = delete;
  ~Ticker() { SetEvent(end_.get()); }

 private:
  UniqueHandle end_;
  std::jthread thread_;  // ends before all that it uses
};

// The abort event of a call: null for a token that cannot be stopped.
class StopEvent {
 public:
  explicit StopEvent(const std::stop_token& stop) {
    if (!stop.stop_possible()) return;
    event_.reset(MakeEvent());
    const auto look = [stop, event = event_.get()] {
      if (stop.stop_requested()) SetEvent(event);
    };
    look();  // nothing is sent when the stop came before
    ticker_ = std::make_unique<Ticker>(look);
  }
  HANDLE get() const noexcept { return event_.get(); }

 private:
  UniqueHandle event_;
  std::unique_ptr<Ticker> ticker_;
};

template <typename SystemTime>  // SYSTEMTIME, or the record of that layout in rcvlink.h
std::optional<File::Time> ToTime(const SystemTime& time) {
  using namespace std::chrono;
  const year_month_day day(year(time.wYear), month(time.wMonth), std::chrono::day(time.wDay));
  // An unknown time has month 0. Windows has no times before 1601.
  if (!day.ok() || day.year() < year(1601)) return std::nullopt;
  return local_days(day) + hours(time.wHour) + minutes(time.wMinute) + seconds(time.wSecond) +
         milliseconds(time.wMilliseconds);
}

// The right to use the library's table of file lists, which has no lock of its own.
class FileListTurn {
 public:
  FileListTurn(const std::stop_token& stop, const std::string& tried) {
    std::unique_lock lock(Queue().mutex);
    do {
      ThrowIfStopped(stop, tried);
    } while (!Queue().freed.wait_for(lock, kPoll, [] { return !Queue().taken; }));
    Queue().taken = true;
  }
  FileListTurn(const FileListTurn&) = delete;
  FileListTurn& operator=(const FileListTurn&) = delete;
  ~FileListTurn() {
    {
      const std::scoped_lock lock(Queue().mutex);
      Queue().taken = false;
    }
    Queue().freed.notify_one();
  }

 private:
  struct State {
    std::mutex mutex;
    std::condition_variable freed;
    bool taken = false;
  };
  static State& Queue() {
    static State state;
    return state;
  }
};

inline bool HasFile(const std::vector<File>& files, const std::wstring& name) {
  return std::any_of(
      files.begin(), files.end(), [&](const File& file) { return file.name == name; });
}

inline Receiver Found(long result,
                      void* handle,
                      const std::stop_token& stop,
                      const std::wstring& port) {
  Receiver receiver(handle);
  Check(result, stop, "find a receiver on " + Utf8(port));
  return receiver;
}

}  // namespace detail

inline const std::error_category& Category() noexcept {
  static const detail::HresultCategory category;
  return category;
}

inline void Report::Write(std::wstring_view line) {
  std::wstring format;
  for (const wchar_t character : line) format.append(character == L'%' ? 2 : 1, character);
  dump_hlp::DumpReportString((format + L"\r\n").c_str(), nullptr);
}

inline Lock::Lock(const Receiver& receiver, const std::stop_token& stop) {
  constexpr const char* kTried = "lock the receiver";
  detail::ThrowIfStopped(stop, kTried);
  const detail::StopEvent stopped(stop);
  long result = devapi::LockConnection(receiver.handle(), stopped.get());
  if (result < 0) {
    // The thread that held it may have ended: it is ours then, in spite of the result.
    devapi::UnlockConnection(receiver.handle());
    result = devapi::LockConnection(receiver.handle(), stopped.get());
  }
  detail::Check(result, stop, kTried);
  receiver_.reset(receiver.handle());
}

// What the watch of a download looks at.
struct Receiver::Activity {
  const std::chrono::milliseconds silence;
  std::atomic<std::uint64_t> calls{0};  // of the host's functions
  std::atomic<bool> in_host{false};     // one of them runs
  std::atomic<bool> silent{false};      // set by the watch
};

// Aborts an operation from a thread of its own: when a stop is requested, or when the receiver is
// silent. It does so again every second, since a single abort may end a step alone. The receiver is
// locked meanwhile, so that no other thread's operation is meant.
class Receiver::Watch {
 public:
  Watch(void* receiver, const std::stop_token& stop, Activity* activity)
      : receiver_(receiver), stop_(stop), activity_(activity) {
    const bool counts = activity_ != nullptr && activity_->silence.count() > 0;
    if (counts || stop_.stop_possible()) {
      ticker_ = std::make_unique<detail::Ticker>([this] { Look(); });
    }
  }

  // Ends the watch. Returns whether it has aborted.
  bool Finish() {
    ticker_.reset();
    return aborted_at_.has_value();
  }

 private:
  using Clock = std::chrono::steady_clock;

  void Look() {
    constexpr std::chrono::milliseconds kAgain{1000};
    if (!stop_.stop_requested() && !IsSilent()) return;
    const Clock::time_point now = Clock::now();
    if (aborted_at_ && now - *aborted_at_ < kAgain) return;
    aborted_at_ = now;
    devapi::Abort(receiver_);
  }

  bool IsSilent() {
    if (activity_ == nullptr || activity_->silence.count() == 0) return false;
    const std::uint64_t calls = activity_->calls;
    if (activity_->in_host || calls != calls_) {
      calls_ = calls;
      last_news_ = Clock::now();
    } else if (Clock::now() - last_news_ >= activity_->silence) {
      activity_->silent = true;
    }
    return activity_->silent;
  }

  void* const receiver_;
  const std::stop_token stop_;
  Activity* const activity_;
  std::uint64_t calls_ = 0;
  Clock::time_point last_news_ = Clock::now();
  std::optional<Clock::time_point> aborted_at_;
  std::unique_ptr<detail::Ticker> ticker_;  // ends before all that it uses
};

// Executes an operation of the locked receiver, for which a stop may be requested. When it was ended by
// an abort that was left over, it is executed again.
template <typename Operation>
long Receiver::Run(const std::stop_token& stop, Operation operation, Activity* activity) {
  for (;;) {
    Watch watch(handle(), stop, activity);
    const long result = operation();
    const bool aborted = watch.Finish();
    const bool again = result == S_FALSE && !aborted && std::exchange(abort_left_, false);
    abort_left_ = abort_left_ || aborted;
    if (!again) return result;
  }
}

template <typename Operation>
void Receiver::Execute(const char* tried, const std::stop_token& stop, Operation operation) {
  const Lock lock(*this, stop);
  detail::Check(Run(stop, operation), stop, tried);
}

inline Receiver Receiver::Find(std::wstring port, const SearchOptions& options) {
  const detail::StopEvent stopped(options.stop);
  void* handle = nullptr;
  const EInstanceType link = port.starts_with(L"\\\\") ? eInstanceUSB : eInstanceSerial;
  const long result =
      devapi::SearchReceiver(port.data(), link, options.family, stopped.get(), &handle);
  return detail::Found(result, handle, options.stop, port);
}

inline Receiver Receiver::FindAt(std::wstring port, DCB settings, const SearchOptions& options) {
  const detail::StopEvent stopped(options.stop);
  void* handle = nullptr;
  const long result = devapi::CreateReceiverOnSerial(
      port.data(), options.family, &settings, stopped.get(), &handle);
  return detail::Found(result, handle, options.stop, port);
}

// Only Velmar receivers rename, so only they look at the names.
inline EProtocol Receiver::Family() const noexcept {
  return devapi::RenameFile(handle(), nullptr, nullptr) == E_NOTIMPL ? eProtocolQuorin
                                                                     : eProtocolVelmar;
}

inline Identity Receiver::Identify(const std::stop_token& stop) {
  CReceiverInfo info{};
  Execute("read the receiver's identity", stop, [&] {
    const long result = devapi::GetReceiverInfo(handle(), nullptr, &info);
    // A Quorin receiver keeps a lock then. One of the host's own must not be released in its place.
    if (result != S_OK && Family() == eProtocolQuorin) devapi::UnlockConnection(handle());
    return result;
  });
  const UniqueString model(info.bstrModel);
  return {.id = detail::Take(info.bstrReceiverId),
          .model = {model.get(), SysStringLen(model.get())},
          .family = static_cast<EProtocol>(info.dwProtocol),
          .variant = info.dwVariant,
          .features = info.dwFeatures};
}

inline bool Receiver::Answers(const std::stop_token& stop) {
  constexpr const char* kTried = "ask whether the receiver answers";
  const Lock lock(*this, stop);
  const long result = Run(stop, [&] {
    short answer = VARIANT_FALSE;
    const long checked = devapi::CheckConnection(handle(), nullptr, &answer);
    // An abort that was left over looks like no answer.
    return checked == S_OK && answer == VARIANT_FALSE ? S_FALSE : checked;
  });
  if (result == S_OK) return true;
  detail::ThrowIfStopped(stop, kTried);
  if (result != S_FALSE) detail::Throw(result, kTried);
  return false;
}

inline std::vector<File> Receiver::ReadDirectory(const std::stop_token& stop) {
  constexpr const char* kTried = "list the receiver's files";
  const detail::FileListTurn turn(stop, kTried);
  UniqueFileList list;
  const long result = Run(stop, [&] {
    void* opened = nullptr;
    const long read = devapi::OpenFileList(handle(), &opened);
    list.reset(opened);  // also an aborted one is open
    return read;
  });
  detail::Check(result, stop, kTried);
  long count = 0;
  detail::Check(devapi::GetFilesCount(list.get(), &count), {}, kTried);
  std::vector<File> files;
  for (long i = 0; i < count; ++i) {
    CFileInfo info{};
    detail::Check(devapi::GetFileInfo(list.get(), i, &info), {}, kTried);
    files.push_back({.name = detail::Take(info.bstrName),
                     .size = info.dwSize,
                     .time = detail::ToTime(info.stTime1)});
  }
  return files;
}

// The rest of a list that did not fit is still arriving, and would disturb the next command.
inline void Receiver::AwaitEndOfList(const std::stop_token& stop) {
  constexpr std::chrono::minutes kLongest{2};
  const auto start = std::chrono::steady_clock::now();
  while (!Answers(stop)) {
    if (std::chrono::steady_clock::now() - start > kLongest) {
      detail::Throw(Error::kTimedOut, "list the receiver's files");
    }
  }
}

inline std::vector<File> Receiver::Files(const std::stop_token& stop) {
  const Lock lock(*this, stop);
  std::vector<File> files = ReadDirectory(stop);
  if (Family() != eProtocolVelmar) return files;
  if (files.empty()) {
    if (!Answers(stop)) detail::Throw(Error::kTimedOut, "list the receiver's files");
    return ReadDirectory(stop);
  }
  constexpr std::size_t kBuffer = 8192;
  constexpr std::size_t kLongestLineBesidesName = 125;
  std::size_t length = kLongestLineBesidesName;  // of the first that did not fit
  for (const File& file : files) length += kLongestLineBesidesName + file.name.size();
  if (length >= kBuffer) AwaitEndOfList(stop);
  return files;
}

inline File Receiver::FindFile(const std::wstring& name, const std::stop_token& stop) {
  for (File& file : Files(stop)) {
    if (file.name == name) return std::move(file);
  }
  detail::Throw(Error::kNotFound, "find " + detail::Utf8(name) + " on the receiver");
}

#ifdef __GNUC__  // COM's interfaces have no virtual destructor
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wnon-virtual-dtor"
#endif

// The host's functions as the library sees them. What they throw is kept here: no exception may cross
// the DLL. It lives on the stack, so references are only counted.
class Receiver::Transfer final : public IStream {
 public:
  Transfer(void* receiver, std::uint64_t size, const Sink& sink, const DownloadOptions& options)
      : activity{.silence = options.silence},
        receiver_(receiver),
        size_(size),
        sink_(sink),
        progress_(options.progress) {}

  CProgressCallback* progress() { return progress_ ? &callback_ : nullptr; }
  std::uint64_t received() const { return received_; }
  bool too_many() const { return too_many_; }
  void Rethrow() const {
    if (exception_) std::rethrow_exception(exception_);
  }

  HRESULT STDMETHODCALLTYPE Write(const void* bytes, ULONG size, ULONG* written) override {
    if (written != nullptr) *written = 0;
    too_many_ = too_many_ || size > size_ - received_;
    if (too_many_ || !Call([&] { sink_(std::span(static_cast<const std::byte*>(bytes), size)); })) {
      return STG_E_WRITEFAULT;
    }
    received_ += size;
    if (written != nullptr) *written = size;
    return S_OK;
  }
  ULONG STDMETHODCALLTYPE AddRef() override { return ++references_; }
  ULONG STDMETHODCALLTYPE Release() override { return --references_; }
  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID, void** object) override {
    if (object == nullptr) return E_POINTER;
    *object = nullptr;
    return E_NOINTERFACE;
  }
  HRESULT STDMETHODCALLTYPE Read(void*, ULONG, ULONG*) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE Seek(LARGE_INTEGER, DWORD, ULARGE_INTEGER*) override {
    return E_NOTIMPL;
  }
  HRESULT STDMETHODCALLTYPE SetSize(ULARGE_INTEGER) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE CopyTo(IStream*,
                                   ULARGE_INTEGER,
                                   ULARGE_INTEGER*,
                                   ULARGE_INTEGER*) override {
    return E_NOTIMPL;
  }
  HRESULT STDMETHODCALLTYPE Commit(DWORD) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE Revert() override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE LockRegion(ULARGE_INTEGER, ULARGE_INTEGER, DWORD) override {
    return E_NOTIMPL;
  }
  HRESULT STDMETHODCALLTYPE UnlockRegion(ULARGE_INTEGER, ULARGE_INTEGER, DWORD) override {
    return E_NOTIMPL;
  }
  HRESULT STDMETHODCALLTYPE Stat(STATSTG*, DWORD) override { return E_NOTIMPL; }
  HRESULT STDMETHODCALLTYPE Clone(IStream**) override { return E_NOTIMPL; }

  Activity activity;
  bool aborted = false;  // by a progress function that threw

 private:
  static void OnProgress(void* context, unsigned char percent) {
    Transfer& self = *static_cast<Transfer*>(context);
    if (self.exception_) return;
    if (self.Call([&] { self.progress_(percent); })) return;
    self.aborted = true;
    devapi::Abort(self.receiver_);
  }

  // Returns false after an exception, also after an earlier one.
  template <typename Function>
  bool Call(Function function) noexcept {
    if (exception_) return false;
    activity.in_host = true;
    try {
      function();
    } catch (...) {
      exception_ = std::current_exception();
    }
    ++activity.calls;
    activity.in_host = false;
    return !exception_;
  }

  void* const receiver_;
  const std::uint64_t size_;
  const Sink& sink_;
  const Progress& progress_;
  CProgressCallback callback_{OnProgress, this};
  std::exception_ptr exception_;
  std::uint64_t received_ = 0;
  bool too_many_ = false;
  ULONG references_ = 1;
};

#ifdef __GNUC__
#pragma GCC diagnostic pop
#endif

inline void Receiver::Download(const File& file, const Sink& sink, const DownloadOptions& options) {
  constexpr std::uint64_t kMostOfQuorin = 65536 * 512;  // blocks, bytes of a block
  const std::string tried = "download " + detail::Utf8(file.name);
  if (file.size > kMostOfQuorin && Family() == eProtocolQuorin) {
    detail::Throw(Error::kTooLarge, tried);
  }
  const Lock lock(*this, options.stop);
  if (file.size == 0) return;
  std::wstring name = file.name;
  Transfer transfer(handle(), file.size, sink, options);
  const long result = Run(
      options.stop,
      [&] {
        // Not again when bytes have come.
        if (transfer.received() > 0) return static_cast<long>(S_FALSE);
        return devapi::DownloadFile(handle(), name.data(), &transfer, transfer.progress());
      },
      &transfer.activity);
  abort_left_ = abort_left_ || transfer.aborted;
  transfer.Rethrow();
  if (result == S_OK && transfer.received() == file.size) return;
  detail::ThrowIfStopped(options.stop, tried);
  if (transfer.activity.silent) detail::Throw(Error::kTimedOut, tried);
  if (result == S_OK || transfer.too_many()) {
    detail::Throw(Error::kOtherSize,
                  tried + ": " +
                      (transfer.too_many() ? "more than the "
                                           : std::to_string(transfer.received()) + " of ") +
                      std::to_string(file.size) + " bytes");
  }
  detail::Throw(result, tried);
}

// The file with ".part" after its name; deleted unless it is complete.
class Receiver::PartFile {
 public:
  explicit PartFile(const std::filesystem::path& target) : target_(target), part_(target) {
    part_ += L".part";
    file_.reset(CreateFileW(
        part_.c_str(), GENERIC_WRITE, 0, nullptr, CREATE_ALWAYS, FILE_ATTRIBUTE_NORMAL, nullptr));
    if (file_.get() == INVALID_HANDLE_VALUE) Fail(GetLastError(), "create ", part_);
  }
  PartFile(const PartFile&) = delete;
  PartFile& operator=(const PartFile&) = delete;
  ~PartFile() {
    file_.reset();
    if (!complete_) DeleteFileW(part_.c_str());
  }

  void Write(std::span<const std::byte> bytes) {
    DWORD written = 0;
    const DWORD size = static_cast<DWORD>(bytes.size());
    if (!WriteFile(file_.get(), bytes.data(), size, &written, nullptr)) {
      Fail(GetLastError(), "write ", part_);
    }
    if (written != size) Fail(ERROR_DISK_FULL, "write ", part_);
  }

  void SetTime(File::Time time) {
    using Ticks = std::chrono::duration<std::uint64_t, std::ratio<1, 10'000'000>>;
    constexpr std::chrono::seconds kFrom1601To1970{11'644'473'600};
    const std::uint64_t ticks =
        std::chrono::duration_cast<Ticks>(time.time_since_epoch() + kFrom1601To1970).count();
    constexpr unsigned kHighHalf = 32;
    const FILETIME file_time{static_cast<DWORD>(ticks), static_cast<DWORD>(ticks >> kHighHalf)};
    if (!SetFileTime(file_.get(), nullptr, nullptr, &file_time)) {
      Fail(GetLastError(), "set the time of ", part_);
    }
  }

  void Complete() {
    if (!FlushFileBuffers(file_.get())) Fail(GetLastError(), "write ", part_);
    file_.reset();
    complete_ = true;
    constexpr DWORD kHow = MOVEFILE_REPLACE_EXISTING | MOVEFILE_WRITE_THROUGH;
    if (!MoveFileExW(part_.c_str(), target_.c_str(), kHow)) {
      Fail(GetLastError(), "rename the complete download to ", target_);
    }
  }

 private:
  [[noreturn]] static void Fail(DWORD error, const char* tried, const std::filesystem::path& path) {
    detail::ThrowWin32(error, tried + detail::Utf8(path.native()));
  }

  const std::filesystem::path target_;
  std::filesystem::path part_;
  detail::UniqueHandle file_;
  bool complete_ = false;
};

inline void Receiver::Download(const File& file,
                               const std::filesystem::path& target,
                               const DownloadOptions& options) {
  PartFile part(target);
  Download(
      file, [&](std::span<const std::byte> bytes) { part.Write(bytes); }, options);
  if (options.set_time && file.time) part.SetTime(*file.time);
  part.Complete();
}

inline void Receiver::Delete(const std::wstring& name, const std::stop_token& stop) {
  const std::string tried = "delete " + detail::Utf8(name);
  const Lock lock(*this, stop);
  std::wstring sent = name;
  Execute(tried.c_str(), stop, [&] { return devapi::DeleteFileW(handle(), sent.data()); });
  if (Family() == eProtocolVelmar && detail::HasFile(Files(stop), name)) {
    detail::Throw(Error::kRefusedOrLost, tried);
  }
}

inline void Receiver::Rename(const std::wstring& from,
                             const std::wstring& to,
                             const std::stop_token& stop) {
  const std::string tried = "rename " + detail::Utf8(from) + " to " + detail::Utf8(to);
  const Lock lock(*this, stop);
  std::wstring sent_from = from;
  std::wstring sent_to = to;
  Execute(tried.c_str(), stop, [&] {
    return devapi::RenameFile(handle(), sent_from.data(), sent_to.data());
  });
  const std::vector<File> files = Files(stop);
  if (detail::HasFile(files, from) || !detail::HasFile(files, to)) {
    detail::Throw(Error::kRefusedOrLost, tried);
  }
}

inline void Receiver::SetBaudRate(unsigned long bits_per_second) {
  Execute("set the receiver's speed", {}, [&] {
    return devapi::DCSetRcvBaudrate(handle(), bits_per_second);
  });
}

inline void Receiver::SetParity(Parity parity) {
  // The families number it differently.
  const Parity first = Family() == eProtocolQuorin ? Parity::kOdd : Parity::kEven;
  const unsigned char number = parity == Parity::kNone ? 0 : parity == first ? 1 : 2;
  Execute(
      "set the receiver's parity", {}, [&] { return devapi::DCSetRcvParity(handle(), number); });
}

inline void Receiver::SetStopBits(int count) {
  const int number = Family() == eProtocolQuorin ? count - 1 : count;
  Execute("set the receiver's stop bits", {}, [&] {
    return devapi::DCSetRcvStopbits(handle(), static_cast<unsigned char>(number));
  });
}

inline void Receiver::SetRts(bool on) {
  Execute("set the receiver's RTS line", {}, [&] {
    return devapi::DCSetRcvRTSControl(handle(), on ? 1 : 0);
  });
}

/// @endcond

}  // namespace rcvlink

#endif  // RCVLINK_RCVLINK_HPP_
