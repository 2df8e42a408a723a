#include "report/report_file.h"

#include <algorithm>
#include <array>
#include <cstdarg>
#include <cstdio>
#include <mutex>
#include <new>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "platform/critical_section.h"
#include "platform/handle.h"
#include "platform/hresult.h"
#include "platform/process_object.h"
#include "platform/text.h"
#include "platform/win32.h"

using rcvlink::CheckFormat;
using rcvlink::CriticalSection;
using rcvlink::FileHandle;
using rcvlink::FormatArguments;
using rcvlink::HResultError;
using rcvlink::HResultFromError;
using rcvlink::ProcessObject;

namespace {

class ReportFile {
 public:
  void Create(const wchar_t* name);
  void Close() { file_.Reset(); }
  bool IsOpen();

  void WriteEntry(const char* format, va_list arguments);
  void WriteEntry(const wchar_t* format, va_list arguments);

 private:
  void Write(const char* bytes, size_t length);

  CriticalSection lock_;
  FileHandle file_;
};

constexpr size_t kStampSize = 32;  // more than a stamp with the longest number of a thread

constinit ProcessObject<ReportFile> report;

ReportFile& TheReport() { return report.get(); }

void ReportFile::Create(const wchar_t* name) {
  Close();
  if (!name) return;
  std::array<wchar_t, MAX_PATH> path{};
  const DWORD folder_length = GetTempPathW(MAX_PATH, path.data());
  // A path that does not fit with its ending zero is refused: a cut one would name another file.
  if (folder_length == 0 || folder_length + std::wstring_view(name).size() >= path.size()) return;
  std::ranges::copy(std::wstring_view(name), path.begin() + folder_length);
  file_ = FileHandle(CreateFileW(path.data(),
                                 GENERIC_WRITE,
                                 FILE_SHARE_READ,
                                 nullptr,
                                 CREATE_ALWAYS,
                                 FILE_ATTRIBUTE_HIDDEN,
                                 nullptr));
}

bool ReportFile::IsOpen() {
  const std::scoped_lock lock(lock_);
  return static_cast<bool>(file_);
}

// A write that fails is ignored: an operation does not fail because it cannot be traced.
void ReportFile::Write(const char* bytes, size_t length) {
  DWORD written = 0;
  WriteFile(file_.get(), bytes, static_cast<DWORD>(length), &written, nullptr);
}

// The beginning of an entry: the local time and the thread. The milliseconds have four digits: programs
// that read reports find the text by this width.
size_t PrintStamp(std::span<char> out) {
  SYSTEMTIME now;
  GetLocalTime(&now);
  const int length = sprintf_s(out.data(),
                               out.size(),
                               "%02u:%02u:%02u.%04u %6lu ",
                               now.wHour,
                               now.wMinute,
                               now.wSecond,
                               now.wMilliseconds,
                               GetCurrentThreadId());
  return static_cast<size_t>(std::max(length, 0));
}

std::vector<char> AllocateEntry(size_t size) {
  try {
    return std::vector<char>(size);
  } catch (const std::bad_alloc&) {
    throw HResultError(E_OUTOFMEMORY);
  }
}

// Without a report an entry is not made; but a format that is wrong is raised all the same, so that a
// host finds its mistake also when nobody traces.
void ReportFile::WriteEntry(const char* format, va_list arguments) {
  const std::scoped_lock lock(lock_);
  if (!file_) return CheckFormat(format, arguments);
  const std::string text = FormatArguments(format, arguments);

  std::vector<char> entry = AllocateEntry(kStampSize + text.size());
  const size_t stamp_length = PrintStamp(entry);
  std::ranges::copy(text, entry.begin() + static_cast<ptrdiff_t>(stamp_length));
  Write(entry.data(), stamp_length + text.size());
}

void ReportFile::WriteEntry(const wchar_t* format, va_list arguments) {
  const std::scoped_lock lock(lock_);
  if (!file_) return CheckFormat(format, arguments);
  const std::wstring text = FormatArguments(format, arguments);

  // Most entries are short and are converted on the stack.
  constexpr size_t kUsualEntry = 1024;
  std::array<char, kStampSize + (kUsualEntry + 1) * sizeof(wchar_t)> usual;
  std::vector<char> longer;
  const size_t size = kStampSize + (text.size() + 1) * sizeof(wchar_t);
  if (size > usual.size()) longer = AllocateEntry(size);
  const std::span<char> entry = longer.empty() ? std::span<char>(usual) : std::span<char>(longer);
  const size_t stamp_length = PrintStamp(entry.first<kStampSize>());
  const std::span<char> converted = entry.subspan(stamp_length);
  if (WideCharToMultiByte(CP_THREAD_ACP,
                          0,
                          text.c_str(),
                          static_cast<int>(text.size()) + 1,
                          converted.data(),
                          static_cast<int>(converted.size()),
                          nullptr,
                          nullptr) == 0) {
    return;
  }
  // As many bytes as the text has characters: with multi-byte characters the end of the line is
  // cut. A host that compares reports byte for byte with those of another version relies on it.
  Write(entry.data(), stamp_length + text.size());
}

}  // namespace

namespace dump_hlp {

void CreateReportFile(const wchar_t* name) { TheReport().Create(name); }

void CreateReportFile(const char* name) {
  // Enough for most names; a longer one is measured and converted again.
  constexpr int kUsualName = 128;
  std::wstring wide(kUsualName, L'\0');
  int length = MultiByteToWideChar(CP_THREAD_ACP, 0, name, -1, wide.data(), kUsualName);
  if (length == 0 && GetLastError() == ERROR_INSUFFICIENT_BUFFER) {
    length = MultiByteToWideChar(CP_THREAD_ACP, 0, name, -1, nullptr, 0);
    wide.resize(static_cast<size_t>(length));
    length = MultiByteToWideChar(CP_THREAD_ACP, 0, name, -1, wide.data(), length);
  }
  if (length == 0) throw HResultError(HResultFromError(GetLastError()));
  CreateReportFile(wide.c_str());
}

void DumpReportString(const char* format, char* arguments) {
  TheReport().WriteEntry(format, arguments);
}

void DumpReportString(const wchar_t* format, char* arguments) {
  TheReport().WriteEntry(format, arguments);
}

void CloseReportFile() { TheReport().Close(); }

}  // namespace dump_hlp

bool rcvlink::IsReportOpen() { return TheReport().IsOpen(); }

namespace {

// An operation does not fail because it cannot be traced: when there is no memory for a line, the
// report goes on without it. The library's own formats need no check, so without a report a line costs
// only the look for one.
template <typename Character>
void WriteOrSkip(const Character* format, va_list arguments) noexcept {
  if (!rcvlink::IsReportOpen()) return;
  try {
    dump_hlp::DumpReportString(format, arguments);
  } catch (const HResultError&) {
  }
}

}  // namespace

void rcvlink::Trace(const wchar_t* format, ...) noexcept {
  va_list arguments;
  va_start(arguments, format);
  WriteOrSkip(format, arguments);
  va_end(arguments);
}

void rcvlink::Trace(const char* format, ...) noexcept {
  va_list arguments;
  va_start(arguments, format);
  WriteOrSkip(format, arguments);
  va_end(arguments);
}

void rcvlink::PrepareReport() { TheReport(); }
