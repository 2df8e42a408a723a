// What the library allocates while it works. A host of many receivers sees it.
#include <gtest/gtest.h>

#include <string>

#include "tests/support/allocations.h"
#include "tests/torture/session.h"

namespace torture {
namespace {

// Discards what it gets.
class Sink : public MemoryStream {
 public:
  HRESULT STDMETHODCALLTYPE Write(const void*, ULONG size, ULONG* written) override {
    if (written) *written = size;
    return S_OK;
  }
};

size_t BytesOfList(size_t count) {
  sim::FileStore files;
  for (size_t i = 0; i < count; ++i) {
    files.Add("LOG" + std::to_string(100'000 + i) + ".JPS", sim::Bytes(10), 1'700'000'000);
  }
  const Link link = {"", eInstanceSerial, eProtocolQuorin};
  Bench bench(link, std::move(files));
  const Found receiver(link);
  const Allocations allocations;
  void* list = nullptr;
  EXPECT_EQ(devapi::OpenFileList(receiver.handle(), &list), S_OK);
  long listed = 0;
  devapi::GetFilesCount(list, &listed);
  EXPECT_EQ(listed, static_cast<long>(count));
  const size_t bytes = Allocations::Bytes();
  devapi::CloseFileList(list);
  return bytes;
}

TEST(MemoryUse, OfAQuorinDirectoryGrowsWithItsFiles) {
  const size_t few = BytesOfList(100);
  const size_t many = BytesOfList(1400);
  EXPECT_LT((many - few) / 1300, 200U);
}

size_t AllocationsOfDownload(EProtocol family, size_t size) {
  sim::FileStore files;
  files.Add("A.LOG", sim::Bytes(size, 'x'), 1'700'000'000);
  const Link link = {"", eInstanceSerial, family};
  Bench bench(link, std::move(files));
  const Found receiver(link);
  Sink sink;
  wchar_t name[] = L"A.LOG";
  const Allocations allocations;
  EXPECT_EQ(devapi::DownloadFile(receiver.handle(), name, &sink, nullptr), S_OK);
  return Allocations::Count();
}

TEST(MemoryUse, OfADownloadDoesNotGrowWithTheFile) {
  EXPECT_EQ(AllocationsOfDownload(eProtocolQuorin, 10'000),
            AllocationsOfDownload(eProtocolQuorin, 99'000));
  EXPECT_EQ(AllocationsOfDownload(eProtocolVelmar, 3'000),
            AllocationsOfDownload(eProtocolVelmar, 100'000));
}

}  // namespace
}  // namespace torture
