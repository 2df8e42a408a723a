// The code of docs/guide.md, as a host uses it.
#include <gtest/gtest.h>
#include <windows.h>

#include <atomic>
#include <future>

#include "examples/guide.h"
#include "tests/host/support/lock.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"
#include "tests/host/support/velmar.h"
#include "tests/support/content.h"

namespace {

constexpr DWORD kLong = 60000;

// Counts what is written, for the thread that watches.
class CountingStream : public MemoryStream {
 public:
  std::atomic<size_t> count = 0;

  HRESULT STDMETHODCALLTYPE Write(const void* data, ULONG size, ULONG* written) override {
    count += size;
    return MemoryStream::Write(data, size, written);
  }
};

TEST(Guide, IdentityLeavesNoLock) {
  const bed::SimulatedPort port({"quorin"});
  const bed::SimulatedPort refusing({"quorin", "--refuse", "print,/par/rcvid"});
  const host::Receiver receiver(port);
  EXPECT_EQ(ModelOf(receiver.get()), receiver.Identify().model);
  EXPECT_NE(ModelOf(receiver.get()), L"");
  const host::Receiver second(refusing);
  EXPECT_EQ(ModelOf(second.get()), L"");
  EXPECT_EQ(host::TryLockElsewhere(second.get()), S_OK);
}

TEST(Guide, FileIsDeletedWhenItIsUnchanged) {
  const bed::SimulatedPort port({"quorin"}, {{"A.log", Content(700)}, {"B.log", Content(800)}});
  const host::Receiver receiver(port);
  EXPECT_FALSE(DeleteUnchanged(receiver.get(), L"A.log", 699));
  EXPECT_TRUE(IsListed(receiver.get(), L"A.log", 700));
  EXPECT_TRUE(DeleteUnchanged(receiver.get(), L"A.log", 700));
  EXPECT_FALSE(IsListed(receiver.get(), L"A.log"));
  EXPECT_TRUE(IsListed(receiver.get(), L"B.log"));
  EXPECT_EQ(host::TryLockElsewhere(receiver.get()), S_OK);
}

// A download with a watch. Gives whether the watch has aborted it.
bool DownloadWatched(void* receiver, CountingStream& stream, HANDLE cancel, DWORD quiet_ms) {
  host::Event done;
  auto watch = host::OnThread(
      [&] { return WatchDownload(receiver, done.get(), cancel, stream.count, quiet_ms); });
  wchar_t name[] = L"A.log";
  devapi::DownloadFile(receiver, name, &stream, nullptr);
  done.Set();
  return watch.get();
}

TEST(Guide, WatchLeavesADownloadAlone) {
  const bed::SimulatedPort port({"quorin"}, {{"A.log", Content(5000)}});
  const host::Receiver receiver(port);
  const host::Event cancel;
  CountingStream stream;
  EXPECT_FALSE(DownloadWatched(receiver.get(), stream, cancel.get(), kLong));
  EXPECT_EQ(stream.bytes, Content(5000));
}

TEST(Guide, WatchEndsAQuietDownload) {
  bed::SimulatedPort port({"quorin", "--speed", "115200"}, {{"A.log", Content(5000)}});
  const host::Receiver receiver(port, CBR_115200);
  const host::Event cancel;
  CountingStream stream;
  port.Pause();
  EXPECT_TRUE(DownloadWatched(receiver.get(), stream, cancel.get(), 300));
  port.Resume();
  EXPECT_EQ(stream.count, 0U);
}

// The abort of a Velmar download is left for the operation after it.
TEST(Guide, NothingIsLeftOfACancel) {
  host::Velmar receiver({}, {{"A.log", Content(5000)}}, CBR_115200);
  const host::Event cancel(true);
  CountingStream stream;
  receiver.port.Pause();
  EXPECT_TRUE(DownloadWatched(receiver.get(), stream, cancel.get(), kLong));
  receiver.port.Resume();
  TakeLeftAbort(receiver.get());
  EXPECT_TRUE(IsListed(receiver.get(), L"A.log"));
}

TEST(Guide, HostWritesIntoTheReport) {
  const host::Report report;
  Report(L"version %u of %s\r\n", 7U, L"the host");
  EXPECT_TRUE(report.Has("version 7 of the host"));
}

}  // namespace
