// Two downloads from one receiver at once: they take turns.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <chrono>
#include <map>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include "rcvlink.h"
#include "tests/host/support/lock.h"
#include "tests/host/support/progress.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"
#include "tests/host/support/velmar.h"
#include "tests/support/content.h"
#include "tests/support/memory_stream.h"

using host::TryLockElsewhere;
using testing::AnyOf;
using testing::ElementsAreArray;

namespace {

constexpr size_t kFirstSize = 9000;
constexpr size_t kSecondSize = 7001;

using Files = std::map<std::string, std::string>;

Files TwoFiles() {
  std::string second = Content(kSecondSize + 1).substr(1);
  return {{"A.log", Content(kFirstSize)}, {"B.log", std::move(second)}};
}

// Stops after some of the file has arrived. The download then holds the receiver's lock, and no
// other.
class HeldStream : public MemoryStream {
 public:
  HRESULT STDMETHODCALLTYPE Write(const void* data, ULONG size, ULONG* written) override {
    const HRESULT result = MemoryStream::Write(data, size, written);
    if (writes == 2) gate.Pass();
    return result;
  }

  host::Gate gate;
};

// The receivers, each on its link: the handle, and the file commands that were sent, in order.

class QuorinOnSerial {
 public:
  void* handle() const { return receiver_.get(); }
  host::Lines Turns() const {
    host::Lines turns;
    for (const std::string& line : receiver_.WireSince()) {
      const bool of_a_file = line.find(".log") != std::string::npos;
      if (of_a_file || line == "> #" || line.starts_with("= speed")) turns.push_back(line);
    }
    return turns;
  }
  static host::Lines TurnOf(const std::string& name) {
    return {"= speed 115200",
            "> %#%print,/log/" + name + R"(&size\r\n)",
            "> %#%get,\"" + name + R"(":{500,512}\r\n)",
            "> #",
            "= speed 9600"};
  }

 private:
  const bed::SimulatedPort port_{{"quorin"}, TwoFiles()};
  const host::Receiver receiver_{port_};
};

class QuorinOnUsb {
 public:
  void* handle() const { return receiver_.get(); }
  host::Lines Turns() const {
    host::Lines turns;
    for (const std::string& line : receiver_.SentSince()) {
      if (line.find(".log") != std::string::npos || line == "#") turns.push_back(line);
    }
    return turns;
  }
  static host::Lines TurnOf(const std::string& name) {
    return {
        "%#%print,/log/" + name + R"(&size\r\n)", "%#%get,\"" + name + R"(":{500,512}\r\n)", "#"};
  }

 private:
  const bed::SimulatedUsb usb_{{"quorin"}, TwoFiles()};
  const host::UsbReceiver receiver_{usb_};
};

class VelmarOnSerial {
 public:
  void* handle() const { return receiver_.get(); }
  host::Lines Turns() const {
    receiver_.port.WaitForTranscript("= speed 9600\n");
    host::Lines turns;
    for (const std::string& line : receiver_.SentAndMoved()) {
      if (!line.starts_with("< log")) turns.push_back(line);
    }
    return turns;
  }
  static host::Lines TurnOf(const std::string& name) {
    return {R"(> log comconfiga once\r)",
            R"(> COM 115200 N 8 1 N\r)",
            "= speed 115200",
            "> currentfile " + name + R"( all\r)",
            R"(> log filehdra\r)",
            R"(> log filetransferb\r)",
            R"(> log comconfiga once\r)",
            R"(> COM 9600 N 8 1 N\r)",
            "= speed 9600"};
  }

 private:
  const host::Velmar receiver_{{}, TwoFiles()};
};

template <typename Link>
class ApiTwoDownloads : public testing::Test {
 protected:
  long Download(std::wstring name, IStream& stream) const {
    return devapi::DownloadFile(link_.handle(), name.data(), &stream, nullptr);
  }
  // How often a download got the lock.
  size_t TimesLocked() const {
    size_t times = 0;
    for (const std::string& line : report_.Lines()) {
      times += line.ends_with("::DownloadFile - connection is locked [HANDLE]");
    }
    return times;
  }
  static host::Lines TurnsOf(const std::vector<std::string>& names) {
    host::Lines turns;
    for (const std::string& name : names) {
      for (const std::string& line : Link::TurnOf(name)) turns.push_back(line);
    }
    return turns;
  }

  const Link link_{};
  const host::Report report_;
};

struct LinkName {
  template <typename Link>
  static std::string GetName(int) {
    if (std::is_same_v<Link, QuorinOnSerial>) return "QuorinOnSerial";
    return std::is_same_v<Link, QuorinOnUsb> ? "QuorinOnUsb" : "VelmarOnSerial";
  }
};

using Links = testing::Types<QuorinOnSerial, VelmarOnSerial, QuorinOnUsb>;
TYPED_TEST_SUITE(ApiTwoDownloads, Links, LinkName);

// The second download starts in the middle of the first.
TYPED_TEST(ApiTwoDownloads, TakeTurns) {
  constexpr auto kAWhile = std::chrono::milliseconds(300);
  HeldStream first;
  MemoryStream second;
  auto download = host::OnThread([&] { return this->Download(L"A.log", first); });
  ASSERT_TRUE(first.gate.WaitForArrival());
  const size_t told = this->report_.Lines().size();
  auto other = host::OnThread([&] { return this->Download(L"B.log", second); });
  this->report_.WaitFor("CAbstractReceiver::DownloadFile", told);

  EXPECT_EQ(TryLockElsewhere(this->link_.handle()), S_FALSE);
  EXPECT_EQ(other.wait_for(kAWhile), std::future_status::timeout);
  EXPECT_EQ(this->TimesLocked(), 1U);

  first.gate.Open();
  EXPECT_EQ(download.get(), S_OK);
  EXPECT_EQ(other.get(), S_OK);
  EXPECT_TRUE(first.bytes == TwoFiles().at("A.log"));
  EXPECT_TRUE(second.bytes == TwoFiles().at("B.log"));
  EXPECT_EQ(this->TimesLocked(), 2U);
  EXPECT_THAT(this->link_.Turns(), ElementsAreArray(this->TurnsOf({"A.log", "B.log"})));
  EXPECT_EQ(TryLockElsewhere(this->link_.handle()), S_OK) << "the lock is still held";
}

// The holder of the receiver comes first, then both downloads in any order.
TYPED_TEST(ApiTwoDownloads, WaitForAHolderAndThenForEachOther) {
  ASSERT_EQ(devapi::LockConnection(this->link_.handle(), nullptr), S_OK);
  MemoryStream streams[2];
  auto download = host::OnThread([&] { return this->Download(L"A.log", streams[0]); });
  this->report_.WaitFor("CAbstractReceiver::DownloadFile");
  const size_t told = this->report_.Lines().size();
  auto other = host::OnThread([&] { return this->Download(L"B.log", streams[1]); });
  this->report_.WaitFor("CAbstractReceiver::DownloadFile", told);
  EXPECT_EQ(this->TimesLocked(), 0U);

  EXPECT_EQ(devapi::UnlockConnection(this->link_.handle()), S_OK);
  EXPECT_EQ(download.get(), S_OK);
  EXPECT_EQ(other.get(), S_OK);
  EXPECT_TRUE(streams[0].bytes == TwoFiles().at("A.log"));
  EXPECT_TRUE(streams[1].bytes == TwoFiles().at("B.log"));
  EXPECT_THAT(this->link_.Turns(),
              AnyOf(ElementsAreArray(this->TurnsOf({"A.log", "B.log"})),
                    ElementsAreArray(this->TurnsOf({"B.log", "A.log"}))));
}

}  // namespace
