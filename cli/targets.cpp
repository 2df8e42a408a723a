#include "targets.h"

#include <windows.h>

#include <algorithm>

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
          .tried = "keep " + Printable(name),
          .code = ResultOfWin32(error),
          .meaning = std::move(meaning),
          .hint = std::move(hint)};
}

}  // namespace

Targets::Targets(const Place& place) : force_(place.force) {
  (NamesFolder(place) ? folder_ : file_) = place.output;
}

std::filesystem::path Targets::Choose(const std::wstring& name) {
  const std::filesystem::path target = PathOf(name);
  const std::string shown = Printable(target.native());
  if (IsTaken(target)) {
    throw Refusal(name,
                  ERROR_FILE_EXISTS,
                  shown + " is the place of another file of this download already",
                  "Download it by itself, with -o and another name.");
  }
  if (Exists(target) && (!force_ || IsFolder(target))) {
    throw Refusal(name,
                  ERROR_FILE_EXISTS,
                  shown + (IsFolder(target) ? " is a folder" : " exists already"),
                  IsFolder(target) ? "" : "--force overwrites it, -o chooses another place.");
  }
  chosen_.push_back(target);
  return target;
}

std::filesystem::path Targets::PathOf(const std::wstring& name) const {
  if (!file_.empty()) return file_;
  const auto local = SafeLocalName(name);
  if (!local) {
    throw Refusal(name, ERROR_INVALID_NAME, "no file of this computer can have that name", "");
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
