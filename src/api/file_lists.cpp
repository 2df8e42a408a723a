#include "api/file_lists.h"

#include <utility>

#include "api/registry.h"
#include "platform/api_types.h"
#include "platform/hresult.h"
#include "platform/process_object.h"
#include "report/report_file.h"

namespace rcvlink {
namespace {

constinit ProcessObject<FileLists> lists;

}  // namespace

void* FileLists::Insert(std::unique_ptr<CFileList> list) {
  void* const handle = list.get();
  lists_.emplace(handle, std::move(list));
  return handle;
}

const CFileList* FileLists::Find(void* handle) const {
  const auto found = lists_.find(handle);
  return found == lists_.end() ? nullptr : found->second.get();
}

bool FileLists::Remove(void* handle) { return lists_.erase(handle) != 0; }

FileLists& OpenLists() { return lists.get(); }

}  // namespace rcvlink

using rcvlink::CatchResult;
using rcvlink::CopyBstr;
using rcvlink::OpenLists;
using rcvlink::Receivers;
using rcvlink::Trace;
using rcvlink::UniqueBstr;

namespace devapi {

long OpenFileList(void* receiver, void** fileList) {
  const std::shared_ptr<CIReceiver> found = Receivers().Find(receiver);
  if (!fileList || !found) return E_INVALIDARG;
  return CatchResult([&] {
    auto files = std::make_unique<CFileList>();
    const HRESULT result = found->GetFiles(files.get());
    if (FAILED(result)) return result;
    // Also after S_FALSE: a host that tests for failures takes it as success and closes this list.
    *fileList = OpenLists().Insert(std::move(files));
    return result;
  });
}

long GetFilesCount(void* fileList, long* count) {
  if (!count) return E_INVALIDARG;
  const CFileList* const files = OpenLists().Find(fileList);
  if (!files) return E_INVALIDARG;
  *count = files->Count();
  return S_OK;
}

long GetFileInfo(void* fileList, long index, CFileInfo* info) {
  if (!info) return E_INVALIDARG;
  const CFileList* const files = OpenLists().Find(fileList);
  if (!files) return E_INVALIDARG;
  if (index >= files->Count()) return E_INVALIDARG;
  // A negative index gets no result code: it is a mistake in the host's program, which the bounds
  // check of the list shows where it is made.
  const CFileInfo& file = files->At(index);
  *info = file;
  info->bstrName = nullptr;
  return CatchResult([&] {
    UniqueBstr name = CopyBstr(file.bstrName);
    Trace(L"GetFileInfo - [%s] [%u]\r\n", name.get(), file.dwSize);
    info->bstrName = name.release();
    return S_OK;
  });
}

long CloseFileList(void* fileList) { return OpenLists().Remove(fileList) ? S_OK : E_INVALIDARG; }

}  // namespace devapi
