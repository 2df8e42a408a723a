#include "port_memory.h"

#include <windows.h>

#include <shlobj.h>

#include <fstream>
#include <iterator>
#include <memory>
#include <nlohmann/json.hpp>

#include "handle.h"
#include "names.h"
#include "paths.h"
#include "results.h"
#include "text.h"

namespace cli {
namespace {

using Document = nlohmann::json;

struct MemoryFreer {
  void operator()(wchar_t* text) const { CoTaskMemFree(text); }
};

// Locks the memory against other threads and other programs of the user.
class MemoryLock {
 public:
  MemoryLock() : mutex_(CreateMutexW(nullptr, FALSE, L"Local\\rcvlink-cli port memory")) {
    constexpr DWORD kPatienceMs = 2000;
    const DWORD waited = mutex_ ? WaitForSingleObject(mutex_.get(), kPatienceMs) : WAIT_FAILED;
    // Abandoned: its owner was killed. The file is replaced in one step, so it is whole.
    held_ = waited == WAIT_OBJECT_0 || waited == WAIT_ABANDONED;
  }
  ~MemoryLock() {
    if (held_) ReleaseMutex(mutex_.get());
  }
  MemoryLock(const MemoryLock&) = delete;
  MemoryLock& operator=(const MemoryLock&) = delete;

  bool held() const { return held_; }

 private:
  UniqueHandle mutex_;
  bool held_ = false;
};

// The ports of a file; none when it is missing, damaged or something else.
Document PortsIn(const std::filesystem::path& file) {
  constexpr size_t kMostBytes = 1 << 20;
  std::ifstream stream(file, std::ios::binary);
  std::string text;
  for (std::istreambuf_iterator<char> byte(stream), end; byte != end; ++byte) {
    if (text.size() == kMostBytes) return Document::object();
    text += *byte;
  }
  const Document document = Document::parse(text, nullptr, /*allow_exceptions=*/false);
  if (!document.is_object() || !document.contains("ports")) return Document::object();
  const Document& ports = document["ports"];
  return ports.is_object() ? ports : Document::object();
}

// A number or text of an entry, whatever the entry is.
template <typename T>
T ValueOf(const Document& entry, const char* name, const T& otherwise) {
  if (!entry.is_object() || !entry.contains(name)) return otherwise;
  const Document& value = entry[name];
  if constexpr (std::is_same_v<T, std::string>) {
    return value.is_string() ? value.get<std::string>() : otherwise;
  } else {
    return value.is_number_unsigned() ? value.get<T>() : otherwise;
  }
}

std::optional<KnownSetting> SettingOf(const Document& entry) {
  const auto speed = ValueOf<uint64_t>(entry, "speed", 0);
  const auto rts = ParseRts(ValueOf<std::string>(entry, "rts", ""));
  const auto family = ParseFamily(ValueOf<std::string>(entry, "protocol", ""));
  if (speed < kSlowestSpeed || speed > kFastestSpeed || !rts || !family) return std::nullopt;
  return KnownSetting{{static_cast<unsigned long>(speed), *rts}, *family};
}

Document EntryOf(const KnownSetting& setting) {
  return {{"speed", setting.line.speed},
          {"rts", RtsWord(setting.line.rts)},
          {"protocol", FamilyWord(setting.family)}};
}

// Replaces the file in one step, so that nobody reads half of it.
bool Replace(const std::filesystem::path& file, const Document& ports) {
  constexpr int kIndent = 2;
  const std::filesystem::path fresh = file.native() + L".new";
  std::ofstream stream(fresh, std::ios::binary | std::ios::trunc);
  stream << Document{{"ports", ports}}.dump(kIndent) << "\n";
  stream.close();
  const bool replaced =
      stream && MoveFileExW(fresh.c_str(), file.c_str(), MOVEFILE_REPLACE_EXISTING);
  if (!replaced) DeleteFileW(fresh.c_str());
  return replaced;
}

std::string KeyOf(const std::wstring& port) { return ToUtf8(Capitals(port)); }

}  // namespace

std::filesystem::path PortMemory::UsualFile() {
  wchar_t* found = nullptr;
  const HRESULT result = SHGetKnownFolderPath(FOLDERID_LocalAppData, 0, nullptr, &found);
  const std::unique_ptr<wchar_t, MemoryFreer> folder(found);
  if (FAILED(result)) return {};
  return std::filesystem::path(folder.get()) / L"rcvlink" / L"ports.json";
}

std::optional<KnownSetting> PortMemory::Recall(const std::wstring& port) const {
  if (file_.empty()) return std::nullopt;
  const MemoryLock lock;
  if (!lock.held()) return std::nullopt;
  const Document ports = PortsIn(file_);
  const auto entry = ports.find(KeyOf(port));
  return entry == ports.end() ? std::nullopt : SettingOf(*entry);
}

bool PortMemory::Remember(const std::wstring& port, const KnownSetting& setting) const {
  if (file_.empty()) return true;
  const MemoryLock lock;
  if (!lock.held()) return false;
  Document ports = PortsIn(file_);
  Document& entry = ports[KeyOf(port)];
  if (SettingOf(entry) == setting) return true;
  entry = EntryOf(setting);
  try {
    MakeFolder(file_.parent_path());
  } catch (const Failure&) {
    return false;
  }
  return Replace(file_, ports);
}

bool PortMemory::Forget(const std::wstring& port) const {
  if (file_.empty()) return true;
  const MemoryLock lock;
  if (!lock.held()) return false;
  Document ports = PortsIn(file_);
  return ports.erase(KeyOf(port)) == 0 || Replace(file_, ports);
}

}  // namespace cli
