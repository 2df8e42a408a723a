#include "receiver/file_list.h"

#include <limits>
#include <new>

using rcvlink::UniqueBstr;

CFileList::~CFileList() {
  for (const CFileInfo& file : files_) SysFreeString(file.bstrName);
}

bool CFileList::Append(UniqueBstr name, DWORD size, const SYSTEMTIME& time) {
  // The count must fit into a host's long; so do the bytes of all records.
  constexpr size_t kMaxFiles = std::numeric_limits<int>::max() / sizeof(CFileInfo);
  if (files_.size() >= kMaxFiles) return false;
  CFileInfo file{};
  file.dwSize = size;
  file.stTime1 = time;
  file.stTime2 = time;
  try {
    files_.push_back(file);
  } catch (const std::bad_alloc&) {
    return false;
  }
  files_.back().bstrName = name.release();
  return true;
}

bool CFileList::Reserve(size_t count) {
  try {
    files_.reserve(count);
  } catch (const std::bad_alloc&) {
    return false;
  }
  return true;
}

const CFileInfo& CFileList::At(long index) const {
  if (index < 0 || index >= Count()) {
    RaiseException(EXCEPTION_ARRAY_BOUNDS_EXCEEDED, EXCEPTION_NONCONTINUABLE, 0, nullptr);
  }
  return files_[static_cast<size_t>(index)];
}
