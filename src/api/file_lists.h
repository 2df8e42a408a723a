// The table of open file lists. A list's handle is its address. The table has no lock: rcvlink.h
// asks hosts not to use file lists from two threads at once.
#ifndef RCVLINK_API_FILE_LISTS_H_
#define RCVLINK_API_FILE_LISTS_H_

#include <memory>
#include <unordered_map>

#include "receiver/file_list.h"

namespace rcvlink {

class FileLists {
 public:
  // Registers a list and gives its handle.
  void* Insert(std::unique_ptr<CFileList> list);
  // Null when the handle is unknown.
  const CFileList* Find(void* handle) const;
  // False when the handle is unknown.
  bool Remove(void* handle);
  // Destroys every list, at unload.
  void Clear() { lists_.clear(); }

 private:
  std::unordered_map<void*, std::unique_ptr<CFileList>> lists_;
};

// The table of the process.
FileLists& OpenLists();

}  // namespace rcvlink

#endif  // RCVLINK_API_FILE_LISTS_H_
