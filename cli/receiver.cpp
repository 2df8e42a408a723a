#include "receiver.h"

#include <oleauto.h>
#include <wtypes.h>

#include <algorithm>
#include <utility>

#include "busy.h"
#include "discovery.h"
#include "names.h"
#include "text.h"

namespace cli {
namespace {

constexpr unsigned kRenameFeature = 4;
constexpr const char* kList = "list the receiver's files";

struct ListCloser {
  void operator()(void* list) const { devapi::CloseFileList(list); }
};
using UniqueList = std::unique_ptr<void, ListCloser>;

struct StringFreer {
  void operator()(wchar_t* string) const { SysFreeString(string); }
};

// Takes ownership of a string of the library.
std::wstring Take(wchar_t* string) {
  const std::unique_ptr<wchar_t, StringFreer> owner(string);
  return {string, SysStringLen(string)};
}

// Returns S_OK or the library's result.
long ReadEntry(void* list, long index, RemoteFile& file) {
  CFileInfo info{};
  const long result = devapi::GetFileInfo(list, index, &info);
  if (result != S_OK) return result;
  file = {.name = Take(info.bstrName), .size = info.dwSize, .time = info.stTime1};
  return S_OK;
}

// Whether these files may have filled the library's buffer for a Velmar directory, so that others
// are missing. Assumes that each line has its longest form.
bool MayBeCut(const std::vector<RemoteFile>& files) {
  constexpr size_t kBuffer = 8192;
  constexpr size_t kLongestLineBesidesName = 125;
  size_t length = kLongestLineBesidesName;  // of the first that did not fit
  for (const RemoteFile& file : files) length += kLongestLineBesidesName + file.name.size();
  return length >= kBuffer;
}

}  // namespace

bool Identity::offers_renaming() const { return (features & kRenameFeature) != 0; }

void Aborter::Tick() {
  constexpr unsigned kTicksPerAbort = std::chrono::seconds(1) / kInterval;
  if (ticks_++ % kTicksPerAbort == 0) devapi::Abort(receiver_);
}

Receiver::Receiver(Context& context) : Receiver(context, FindReceiver(context)) {}

Receiver::Receiver(Context& context, const FoundReceiver& found)
    : context_(context),
      interrupt_(context.interrupt),
      handle_(found.handle),
      link_(found.link),
      setting_(found.setting),
      cancel_watch_(Aborter::kInterval, [this, aborter = Aborter(handle())]() mutable {
        if (interrupt_.requested()) aborter.Tick();
      }) {}

const Identity& Receiver::Identify() {
  constexpr const char* kTried = "read the receiver's identity";
  if (identity_) return *identity_;
  ThrowIfCancelled(kTried);
  const Busy busy(context_, "Reading the receiver's identity");
  CReceiverInfo info{};
  const long result = devapi::GetReceiverInfo(handle(), interrupt_.event(), &info);
  if (result != S_OK) {
    devapi::UnlockConnection(handle());  // a failure may have left the receiver locked
    throw FailureOf(
        kTried, result, result == S_FALSE ? "the receiver did not send its identity" : "");
  }
  identity_ = {.id = Take(info.bstrReceiverId),
               .model = Take(info.bstrModel),
               .family = info.dwProtocol,
               .variant = info.dwVariant,
               .features = info.dwFeatures};
  return *identity_;
}

unsigned Receiver::Family() {
  return setting_ ? static_cast<unsigned>(setting_->family) : Identify().family;
}

Directory Receiver::ListFiles() {
  Directory directory{.files = ReadDirectory()};
  directory.doubt = DoubtAbout(directory.files);
  if (!directory.doubt.empty()) {
    context_.PrintWarning("Warning: files may be missing. " + directory.doubt + "\n");
  }
  return directory;
}

std::vector<RemoteFile> Receiver::ReadDirectory() {
  ThrowIfCancelled(kList);
  const Busy busy(context_, "Reading the list of files");
  void* opened = nullptr;
  const long result = devapi::OpenFileList(handle(), &opened);
  const UniqueList list(opened);
  if (result != S_OK) throw FailureOf(kList, result);
  long count = 0;
  if (const long counted = devapi::GetFilesCount(list.get(), &count); counted != S_OK) {
    throw FailureOf(kList, counted);
  }
  std::vector<RemoteFile> files(static_cast<size_t>(count));
  for (long i = 0; i < count; ++i) {
    const long read = ReadEntry(list.get(), i, files[static_cast<size_t>(i)]);
    if (read != S_OK) throw FailureOf(kList, read);
  }
  return files;
}

// Only for Velmar receivers, which are on serial ports. An empty list is read again: the library
// reports a refused or lost command as an empty directory.
std::string Receiver::DoubtAbout(std::vector<RemoteFile>& files) {
  if (!setting_ || setting_->family != eProtocolVelmar) return {};
  if (MayBeCut(files)) AwaitAnswer(kList);
  if (files.empty()) files = ReadDirectory();
  if (files.empty()) {
    return "The list is empty: either the Velmar receiver has no files, or it did not answer. Try "
           "again.";
  }
  if (!MayBeCut(files)) return {};
  return "Only the first 8192 bytes of a Velmar receiver's directory are read, about 70 files. The "
         "other files appear when some have been deleted.";
}

bool Receiver::Answers() {
  short answer = VARIANT_FALSE;
  const long code = devapi::CheckConnection(handle(), interrupt_.event(), &answer);
  return code == S_OK && answer != VARIANT_FALSE;
}

// The rest of a list that did not fit is still arriving and would disturb the next exchange.
void Receiver::AwaitAnswer(const std::string& tried) {
  constexpr uint64_t kLongestRestMs = 120'000;
  const Busy busy(context_, "Waiting for the end of the list");
  const uint64_t start_ms = GetTickCount64();
  while (GetTickCount64() - start_ms < kLongestRestMs) {
    ThrowIfCancelled(tried);
    if (Answers()) return;
  }
  throw FailureOf(tried, ResultOfWin32(ERROR_TIMEOUT), "the receiver no longer answers");
}

Failure Receiver::FailureOf(std::string tried, long code, std::string meaning) const {
  Failure failure{.tried = std::move(tried), .code = code, .meaning = std::move(meaning)};
  if (interrupt_.requested()) {
    failure.exit = ExitCode::kCancelled;
    failure.meaning = "ended by Ctrl-C";
  }
  return failure;
}

void Receiver::ThrowIfCancelled(const std::string& tried) const {
  if (interrupt_.requested()) throw FailureOf(tried, ResultOfWin32(ERROR_CANCELLED));
}

bool HasFile(const std::vector<RemoteFile>& files, const std::wstring& name) {
  return std::any_of(files.begin(), files.end(), [&](const auto& f) { return f.name == name; });
}

const RemoteFile& FindFile(const std::vector<RemoteFile>& files,
                           const std::wstring& name,
                           const std::string& tried) {
  const auto exact =
      std::find_if(files.begin(), files.end(), [&](const auto& f) { return f.name == name; });
  if (exact != files.end()) return *exact;
  const auto similar = std::find_if(
      files.begin(), files.end(), [&](const auto& f) { return SameLocalName(f.name, name); });
  throw Failure{.tried = tried,
                .code = ResultOfWin32(ERROR_FILE_NOT_FOUND),
                .meaning = "the receiver has no file named " + Printable(name),
                .hint = similar == files.end()
                            ? "`rcvlink-cli ls` lists its files. Nothing was done."
                            : "It has " + Printable(similar->name) + ". Nothing was done."};
}

}  // namespace cli
