// A receiver's directory as it was read: records whose names the list owns.
#ifndef RCVLINK_RECEIVER_FILE_LIST_H_
#define RCVLINK_RECEIVER_FILE_LIST_H_

#include <vector>

#include "platform/api_types.h"
#include "platform/text.h"
#include "platform/win32.h"

class CFileList {
 public:
  CFileList() = default;
  CFileList(const CFileList&) = delete;
  CFileList& operator=(const CFileList&) = delete;
  ~CFileList();

  // Appends one file whose both times are `time`. False, with the name freed, when the list cannot
  // grow.
  bool Append(UniqueBstr name, DWORD size, const SYSTEMTIME& time);

  long Count() const { return static_cast<long>(files_.size()); }

  // The record at an index below Count(). Any other raises the structured exception
  // EXCEPTION_ARRAY_BOUNDS_EXCEEDED, which cannot be continued.
  const CFileInfo& At(long index) const;

 private:
  std::vector<CFileInfo> files_;  // doubles its capacity when full
};

#endif  // RCVLINK_RECEIVER_FILE_LIST_H_
