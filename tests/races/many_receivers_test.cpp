// Sixty-four receivers send their files at once, while other threads open and close them by name.
#include <gtest/gtest.h>

#include <atomic>
#include <cstdint>
#include <deque>
#include <memory>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "platform/api_types.h"
#include "platform/clock.h"
#include "simulator/files.h"
#include "simulator/quorin/receiver.h"
#include "simulator/velmar/receiver.h"
#include "tests/races/options.h"
#include "tests/support/content.h"
#include "tests/support/manual_clock.h"
#include "tests/support/memory_stream.h"
#include "tests/support/simulated_com_port.h"
#include "transport/device_calls.h"

namespace races {
namespace {

constexpr size_t kReceivers = 64;
constexpr size_t kOpeners = 4;
constexpr int kDownloads = 2;  // of each receiver
constexpr size_t kFileSize = 9000;
// Those that are opened and closed: so few that the openers meet.
constexpr size_t kBusy = 2;
constexpr size_t kKeepEvery = 50;  // an opener does not close its receiver again

// A receiver on a COM port, with a clock of its own.
class Device {
 public:
  explicit Device(size_t number)
      : name_(L"COM" + std::to_wstring(100 + number)),
        content_(Content(kFileSize + number)),
        receiver_(Make(number)),
        port_(*receiver_, clock_) {
    port_.path = L"\\\\.\\" + name_;
    port_.state.BaudRate = CBR_9600;
  }

  wchar_t* name() { return name_.data(); }
  const std::string& content() const { return content_; }
  rcvlink::Clock& clock() { return clock_; }
  void* handle() const { return handle_; }

  long Search() {
    const rcvlink::SystemCallsOverride calls(port_);
    return devapi::SearchReceiver(name(), eInstanceSerial, eProtocolAny, nullptr, &handle_);
  }

 private:
  std::unique_ptr<sim::Receiver> Make(size_t number) const {
    sim::FileStore files;
    files.Add("A.LOG", sim::Bytes(content_.begin(), content_.end()), 1'700'000'000);
    if (number % 2 == 0) {
      return std::make_unique<sim::QuorinReceiver>(sim::QuorinOptions{}, std::move(files));
    }
    return std::make_unique<sim::VelmarReceiver>(sim::VelmarOptions{}, std::move(files));
  }

  std::wstring name_;
  std::string content_;
  ManualClock clock_;
  std::unique_ptr<sim::Receiver> receiver_;
  SimulatedComPort port_;
  void* handle_ = nullptr;
};

// The devices. Their clocks replace each other, so the last is removed first.
class Devices {
 public:
  Devices() {
    for (size_t i = 0; i < kReceivers; ++i) devices_.emplace_back(i);
  }
  Devices(const Devices&) = delete;
  Devices& operator=(const Devices&) = delete;
  ~Devices() {
    while (!devices_.empty()) devices_.pop_back();
  }

  std::deque<Device>& all() { return devices_; }

 private:
  std::deque<Device> devices_;
};

// Each thread has the clock of its receiver.
class ClockOfThread : public rcvlink::Clock {
 public:
  ClockOfThread() = default;
  ClockOfThread(const ClockOfThread&) = delete;
  ClockOfThread& operator=(const ClockOfThread&) = delete;
  ~ClockOfThread() override { TlsFree(slot_); }

  void Use(rcvlink::Clock& clock) { TlsSetValue(slot_, &clock); }
  DWORD Ticks() override { return Own().Ticks(); }
  void Pause(DWORD milliseconds) override { Own().Pause(milliseconds); }

 private:
  rcvlink::Clock& Own() { return *static_cast<rcvlink::Clock*>(TlsGetValue(slot_)); }

  const DWORD slot_ = TlsAlloc();
  rcvlink::ClockOverride override_{*this};
};

TEST(ManyReceivers, DownloadWhileOthersOpenAndClose) {
  Devices devices;
  ClockOfThread clock;
  for (Device& device : devices.all()) {
    clock.Use(device.clock());
    ASSERT_EQ(device.Search(), S_OK);
  }

  std::atomic<int> mistakes = 0;
  std::atomic<bool> over = false;
  std::vector<std::atomic<int>> users(kReceivers);
  const auto download = [&](size_t i) {
    Device& device = devices.all()[i];
    clock.Use(device.clock());
    for (int n = 0; n < kDownloads; ++n) {
      MemoryStream stream;
      wchar_t file[] = L"A.LOG";
      const long result = devapi::DownloadFile(device.handle(), file, &stream, nullptr);
      if (result != S_OK || stream.bytes != device.content()) ++mistakes;
    }
  };
  const auto open_and_close = [&](size_t opener) {
    std::seed_seq seeds{Seed(), uint64_t{opener}};
    std::mt19937 random(seeds);
    while (!over) {
      const size_t i = random() % kBusy;
      Device& device = devices.all()[i];
      void* handle = nullptr;
      if (devapi::OpenReceiver(device.name(), &handle) != S_OK) ++mistakes;
      if (handle != device.handle()) ++mistakes;
      if (random() % kKeepEvery == 0) {
        ++users[i];
      } else if (devapi::CloseReceiver(handle) != S_FALSE) {
        ++mistakes;
      }
    }
  };

  std::vector<std::thread> openers;
  std::vector<std::thread> workers;
  for (size_t i = 0; i < kOpeners; ++i) openers.emplace_back(open_and_close, i);
  for (size_t i = 0; i < kReceivers; ++i) workers.emplace_back(download, i);
  for (std::thread& worker : workers) worker.join();
  over = true;
  for (std::thread& opener : openers) opener.join();
  EXPECT_EQ(mistakes, 0) << "seed " << Seed();

  int kept = 0;
  for (size_t i = 0; i < kReceivers; ++i) {
    Device& device = devices.all()[i];
    kept += users[i];
    for (int n = 0; n < users[i]; ++n) {
      EXPECT_EQ(devapi::CloseReceiver(device.handle()), S_FALSE) << i;
    }
    EXPECT_EQ(devapi::CloseReceiver(device.handle()), S_OK) << i;
    void* none = nullptr;
    EXPECT_EQ(devapi::OpenReceiver(device.name(), &none), S_FALSE) << i;
  }
  EXPECT_GT(kept, 0) << "the openers did nothing";
}

}  // namespace
}  // namespace races
