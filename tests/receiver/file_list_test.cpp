#include "receiver/file_list.h"

#include <gtest/gtest.h>

#include <climits>
#include <string>

#include "platform/handle.h"
#include "tests/support/allocations.h"

using rcvlink::CopyBstr;
using rcvlink::KernelHandle;

namespace {

const SYSTEMTIME kTime = {2026, 3, 0, 1, 12, 30, 59, 0};

TEST(FileList, StartsEmpty) { EXPECT_EQ(CFileList().Count(), 0); }

TEST(FileList, KeepsRecordsInOrder) {
  CFileList files;
  for (DWORD i = 0; i < 100; ++i) {
    ASSERT_TRUE(files.Append(CopyBstr(std::to_wstring(i).c_str()), i, kTime));
  }
  EXPECT_EQ(files.Count(), 100);
  const CFileInfo& file = files.At(42);
  EXPECT_STREQ(file.bstrName, L"42");
  EXPECT_EQ(file.dwSize, 42u);
  EXPECT_EQ(file.dwPadding, 0u);
  EXPECT_EQ(file.qwReserved, 0u);
  EXPECT_EQ(file.stTime1.wYear, 2026);
  EXPECT_EQ(file.stTime2.wSecond, 59);
}

TEST(FileList, WithoutMemoryItStaysAsItWas) {
  CFileList files;
  bool appended = true;
  bool reserved = true;
  {
    const Allocations failing(0);
    appended = files.Append(CopyBstr(L"a"), 1, kTime);
  }
  {
    const Allocations failing(0);
    reserved = files.Reserve(10);
  }
  EXPECT_FALSE(appended);
  EXPECT_FALSE(reserved);
  EXPECT_EQ(files.Count(), 0);
}

// A thread of its own: the start-up code wraps main in a handler that would swallow the exception.
DWORD RaisedBy(const CFileList* files, long index) {
  struct Call {
    const CFileList* files;
    long index;
    DWORD code;
  } call{files, index, 0};
  static Call* current = nullptr;
  current = &call;
  const auto handler = AddVectoredExceptionHandler(1, [](EXCEPTION_POINTERS* pointers) -> LONG {
    if (pointers->ExceptionRecord->ExceptionCode != EXCEPTION_ARRAY_BOUNDS_EXCEEDED) {
      return EXCEPTION_CONTINUE_SEARCH;
    }
    current->code = pointers->ExceptionRecord->ExceptionCode;
    EXPECT_NE(pointers->ExceptionRecord->ExceptionFlags & EXCEPTION_NONCONTINUABLE, 0u);
    ExitThread(0);
  });
  const KernelHandle thread(CreateThread(
      nullptr,
      0,
      [](void*) -> DWORD {
        current->files->At(current->index);
        return 0;
      },
      nullptr,
      0,
      nullptr));
  WaitForSingleObject(thread.get(), INFINITE);
  RemoveVectoredExceptionHandler(handler);
  return call.code;
}

TEST(FileList, AnIndexOutsideRaisesTheBoundsException) {
  CFileList files;
  files.Append(CopyBstr(L"a"), 1, kTime);
  EXPECT_EQ(RaisedBy(&files, 0), 0u);
  EXPECT_EQ(RaisedBy(&files, -1), 0xC000008Cu);
  EXPECT_EQ(RaisedBy(&files, LONG_MIN), 0xC000008Cu);
  EXPECT_EQ(RaisedBy(&files, 1), 0xC000008Cu);
}

}  // namespace
