#include "part_file.h"

#include <utility>

#include "names.h"
#include "paths.h"
#include "text.h"

namespace cli {

PartFile::PartFile(std::filesystem::path target, Overwrite overwrite, Test test)
    : target_(std::move(target)),
      part_(target_.native() + std::wstring(kPartSuffix)),
      overwrite_(overwrite),
      test_(std::move(test)) {
  const HANDLE file = CreateFileW(part_.c_str(),
                                  GENERIC_WRITE | DELETE,
                                  0,
                                  nullptr,
                                  overwrite.part ? CREATE_ALWAYS : CREATE_NEW,
                                  FILE_ATTRIBUTE_NORMAL,
                                  nullptr);
  const DWORD error = GetLastError();
  if (file == INVALID_HANDLE_VALUE) {
    Failure failure = LocalFailure("create " + Printable(part_.native()), error);
    if (error == ERROR_FILE_EXISTS) {
      failure.hint =
          "An interrupted download left it, or another download is writing it; --force replaces "
          "it.";
    }
    throw failure;
  }
  file_.reset(file);
  SetVanishing(true);
}

PartFile::~PartFile() {
  if (kept_) return;
  file_.reset();
  DeleteFileW(part_.c_str());  // for file systems that cannot delete on close
}

bool PartFile::SetVanishing(bool vanishing) {
  FILE_DISPOSITION_INFO info{};
  info.DeleteFile = vanishing ? TRUE : FALSE;
  return SetFileInformationByHandle(file_.get(), FileDispositionInfo, &info, sizeof(info)) != FALSE;
}

DWORD PartFile::Write(const void* data, DWORD size) {
  DWORD written = 0;
  if (!WriteFile(file_.get(), data, size, &written, nullptr)) return GetLastError();
  return written == size ? ERROR_SUCCESS : ERROR_DISK_FULL;
}

void PartFile::Complete() {
  const BOOL flushed = FlushFileBuffers(file_.get());
  const DWORD flush_error = GetLastError();
  KeepIncomplete();
  if (!flushed) throw KeptFailure(FailureOf(flush_error));
  try {
    if (test_) test_(part_);
  } catch (const Failure& failure) {
    throw KeptFailure(failure);
  }
  const DWORD replace = overwrite_.target ? MOVEFILE_REPLACE_EXISTING : 0;
  if (!MoveFileExW(part_.c_str(), target_.c_str(), replace | MOVEFILE_WRITE_THROUGH)) {
    const DWORD error = GetLastError();
    Failure failure =
        LocalFailure("rename the download to " + Printable(target_.filename().native()), error);
    failure.hint = "The download is complete. Rename the file yourself when " +
                   Printable(target_.filename().native()) + " is free.";
    throw KeptFailure(std::move(failure));
  }
}

std::wstring PartFile::KeepIncomplete() {
  SetVanishing(false);
  file_.reset();
  kept_ = true;
  return part_.native();
}

Failure PartFile::KeptFailure(Failure failure) const {
  failure.kept = ToUtf8(part_.native());
  return failure;
}

Failure PartFile::FailureOf(DWORD error) const {
  return LocalFailure("write " + Printable(part_.native()), error);
}

}  // namespace cli
