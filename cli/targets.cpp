#include "targets.h"

#include <windows.h>

#include <algorithm>

#include "formats.h"
#include "handle.h"
#include "names.h"
#include "paths.h"
#include "results.h"
#include "text.h"

namespace cli {
namespace {

bool NamesFolder(const Place& place) {
  const std::wstring& output = place.output;
  return place.many || output.empty() || output.ends_with(L'\\') || output.ends_with(L'/') ||
         IsFolder(output);
}

Failure Refusal(const std::wstring& name, DWORD error, std::string meaning, std::string hint) {
  return {.exit = ExitCode::kLocalFile,
          .tried = "save " + Printable(name),
          .code = ResultOfWin32(error),
          .meaning = std::move(meaning),
          .hint = std::move(hint)};
}

// Throws Failure when no file can be made in the folder.
void CheckWritable(const std::filesystem::path& folder) {
  const std::string tried = "create files in " + Printable(folder.native());
  if (!IsFolder(folder)) throw LocalFailure(tried, ERROR_DIRECTORY);
  const std::wstring name = L"rcvlink-cli-" + std::to_wstring(GetCurrentProcessId()) + L".tmp";
  const std::filesystem::path probe = folder / name;
  const UniqueHandle file(CreateFileW(probe.c_str(),
                                      GENERIC_WRITE | DELETE,
                                      0,
                                      nullptr,
                                      CREATE_NEW,
                                      FILE_FLAG_DELETE_ON_CLOSE,
                                      nullptr));
  const DWORD error = GetLastError();
  if (file.get() == INVALID_HANDLE_VALUE) throw LocalFailure(tried, error);
}

}  // namespace

Targets::Targets(const Place& place) : force_(place.force) {
  (NamesFolder(place) ? folder_ : file_) = place.output;
}

void Targets::CheckFolder() const {
  if (!file_.empty() && !IsPlainFileName(file_.filename().native())) {
    throw Refusal(file_.native(),
                  ERROR_INVALID_NAME,
                  "the name is not a valid file name on this computer",
                  "");
  }
  const std::filesystem::path existing = ExistingFolder();
  const std::filesystem::path parent = file_.parent_path();
  if (!file_.empty() && !parent.empty() && !IsFolder(parent)) {
    throw Refusal(file_.native(),
                  ERROR_PATH_NOT_FOUND,
                  "there is no folder " + Printable(parent.native()),
                  "Create the folder, or choose another one with -o.");
  }
  CheckWritable(existing);
}

void Targets::CheckRoom(uint64_t bytes) const {
  ULARGE_INTEGER available{};
  const std::filesystem::path folder = ExistingFolder();
  if (!GetDiskFreeSpaceExW(folder.c_str(), &available, nullptr, nullptr)) return;
  if (available.QuadPart >= bytes) return;
  throw Failure{.exit = ExitCode::kLocalFile,
                .tried = "download into " + Printable(folder.native()),
                .code = ResultOfWin32(ERROR_DISK_FULL),
                .meaning = "the disk has room for " + FormatBytes(available.QuadPart) +
                           ", but the files need " + FormatBytes(bytes),
                .hint = "Free some space, choose another disk with -o, or download fewer files."};
}

// The folder of the targets, or the nearest parent that exists.
std::filesystem::path Targets::ExistingFolder() const {
  std::filesystem::path folder = file_.empty() ? folder_ : file_.parent_path();
  folder = std::filesystem::absolute(folder.empty() ? L"." : folder);
  if (!folder.has_filename()) folder = folder.parent_path();
  while (!Exists(folder) && folder.parent_path() != folder) {
    const std::wstring name = folder.filename().native();
    if (!name.empty() && !IsPlainFileName(name)) {
      throw Refusal(
          name, ERROR_INVALID_NAME, "the name is not a valid folder name on this computer", "");
    }
    folder = folder.parent_path();
  }
  return folder;
}

std::filesystem::path Targets::Choose(const std::wstring& name) {
  const std::filesystem::path target = FreePathOf(name);
  const std::string shown = Printable(target.native());
  if (Exists(target) && (!force_ || IsFolder(target))) {
    throw Refusal(
        name,
        ERROR_FILE_EXISTS,
        shown + (IsFolder(target) ? " is a folder" : " already exists"),
        IsFolder(target) ? "" : "--force overwrites it; -o chooses another folder or name.");
  }
  const std::filesystem::path part = target.native() + std::wstring(kPartSuffix);
  if (Exists(part) && (!force_ || IsFolder(part))) {
    throw Refusal(
        name,
        ERROR_FILE_EXISTS,
        Printable(part.native()) + " already exists",
        "An interrupted download left it, or another download is writing it; --force replaces it.");
  }
  chosen_.push_back(target);
  return target;
}

std::optional<std::filesystem::path> Targets::TakeExisting(const std::wstring& name) {
  const std::filesystem::path target = FreePathOf(name);
  if (!Exists(target) || IsFolder(target)) return std::nullopt;
  chosen_.push_back(target);
  return target;
}

// Names that differ only in case are one name on this computer.
std::filesystem::path Targets::FreePathOf(const std::wstring& name) const {
  const std::filesystem::path target = PathOf(name);
  if (!IsTaken(target)) return target;
  throw Refusal(name,
                ERROR_FILE_EXISTS,
                Printable(target.native()) + " is already used for another file of this download",
                "Download this file separately, with -o and another name.");
}

std::filesystem::path Targets::PathOf(const std::wstring& name) const {
  if (!file_.empty()) return file_;
  const auto local = SafeLocalName(name);
  if (!local) {
    throw Refusal(
        name, ERROR_INVALID_NAME, "the name is not a valid file name on this computer", "");
  }
  return folder_ / *local;
}

bool Targets::IsTaken(const std::filesystem::path& target) const {
  const std::wstring part = target.native() + std::wstring(kPartSuffix);
  return std::any_of(chosen_.begin(), chosen_.end(), [&](const std::filesystem::path& other) {
    return SameLocalName(other.native(), target.native()) || SameLocalName(other.native(), part) ||
           SameLocalName(other.native() + std::wstring(kPartSuffix), target.native());
  });
}

}  // namespace cli
