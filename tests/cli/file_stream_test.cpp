#include "file_stream.h"

#include <gtest/gtest.h>

#include "part_file.h"
#include "temporary_folder.h"

namespace cli {
namespace {

class FileStreamTest : public testing::Test {
 protected:
  TemporaryFolder folder_;
  PartFile part_{folder_.path() / L"a", {}};
  std::unique_ptr<FileStream, ComReleaser> stream_ = FileStream::Make(part_);
};

TEST_F(FileStreamTest, WritesAndCounts) {
  ULONG written = 99;
  EXPECT_EQ(stream_->Write("hello", 5, &written), S_OK);
  EXPECT_EQ(written, 5U);
  EXPECT_EQ(stream_->Write(" world", 6, nullptr), S_OK);
  EXPECT_EQ(stream_->received(), 11U);
  EXPECT_EQ(stream_->first_error(), DWORD{ERROR_SUCCESS});
  part_.Complete();
  EXPECT_EQ(folder_.Read(L"a"), "hello world");
}

TEST_F(FileStreamTest, RemembersItsFirstFailure) {
  part_.KeepIncomplete();  // closes the file
  ULONG written = 99;
  EXPECT_EQ(stream_->Write("hello", 5, &written), ResultOfWin32(ERROR_INVALID_HANDLE));
  EXPECT_EQ(written, 0U);
  EXPECT_EQ(stream_->received(), 0U);
  EXPECT_EQ(stream_->first_error(), DWORD{ERROR_INVALID_HANDLE});
}

TEST_F(FileStreamTest, HashesWhatItReceived) {
  stream_->Write("a", 1, nullptr);
  stream_->Write("bc", 2, nullptr);
  stream_->Detach();
  stream_->Write("d", 1, nullptr);
  EXPECT_EQ(stream_->TakeHash(),
            "ba7816bf8f01cfea414140de5dae2223b00361a396177a9cb410ff61f20015ad");
}

TEST_F(FileStreamTest, TakesNothingOnceDetached) {
  stream_->Detach();
  EXPECT_EQ(stream_->Write("hello", 5, nullptr), STG_E_REVERTED);
  EXPECT_EQ(stream_->received(), 0U);
}

TEST_F(FileStreamTest, CountsItsReferences) {
  EXPECT_EQ(stream_->AddRef(), 2U);
  EXPECT_EQ(stream_->Release(), 1U);
  void* object = nullptr;
  EXPECT_EQ(stream_->QueryInterface(IID_IStream, &object), S_OK);
  EXPECT_EQ(object, static_cast<IStream*>(stream_.get()));
  EXPECT_EQ(stream_->Release(), 1U);
  EXPECT_EQ(stream_->QueryInterface(IID_IStorage, &object), E_NOINTERFACE);
  EXPECT_EQ(object, nullptr);
  EXPECT_EQ(stream_->QueryInterface(IID_IStream, nullptr), E_POINTER);
}

TEST_F(FileStreamTest, OffersNothingButWriting) {
  EXPECT_EQ(stream_->Read(nullptr, 0, nullptr), E_NOTIMPL);
  EXPECT_EQ(stream_->Seek({}, STREAM_SEEK_SET, nullptr), E_NOTIMPL);
  EXPECT_EQ(stream_->SetSize({}), E_NOTIMPL);
  EXPECT_EQ(stream_->CopyTo(nullptr, {}, nullptr, nullptr), E_NOTIMPL);
  EXPECT_EQ(stream_->Commit(STGC_DEFAULT), S_OK);
  EXPECT_EQ(stream_->Revert(), E_NOTIMPL);
  EXPECT_EQ(stream_->LockRegion({}, {}, LOCK_WRITE), E_NOTIMPL);
  EXPECT_EQ(stream_->UnlockRegion({}, {}, LOCK_WRITE), E_NOTIMPL);
  EXPECT_EQ(stream_->Stat(nullptr, STATFLAG_DEFAULT), E_NOTIMPL);
  EXPECT_EQ(stream_->Clone(nullptr), E_NOTIMPL);
}

}  // namespace
}  // namespace cli
