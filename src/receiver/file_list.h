// A copy of a receiver's directory. The list owns the names in its records.
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

  // Appends one file. Both its times are set to `time`, since a receiver gives one time for a file.
  // False when the list cannot grow; the name is then freed.
  bool Append(rcvlink::UniqueBstr name, DWORD size, const SYSTEMTIME& time);

  // Makes room for so many files at once; false when there is no memory for them.
  bool Reserve(size_t count);

  long Count() const { return static_cast<long>(files_.size()); }

  // The record at an index below Count(). Any other raises the structured exception
  // EXCEPTION_ARRAY_BOUNDS_EXCEEDED, which cannot be continued.
  const CFileInfo& At(long index) const;

 private:
  std::vector<CFileInfo> files_;
};

#endif  // RCVLINK_RECEIVER_FILE_LIST_H_
