// Downloads with rcvlink.hpp: into a function and into a file; what ends them, and what is left then.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <chrono>
#include <filesystem>
#include <ostream>
#include <stop_token>
#include <string>
#include <thread>
#include <vector>

#include "tests/host/support/hpp.h"
#include "tests/host/support/progress.h"
#include "tests/host/support/report.h"
#include "tests/support/content.h"
#include "tests/support/resources.h"

using host::CodeOf;
using host::OpenHpp;
using rcvlink::DownloadOptions;
using rcvlink::Error;
using rcvlink::File;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;

namespace {

constexpr size_t kSize = 5000;
// Paced, this takes half a minute or more.
constexpr size_t kEndless = 400000;
constexpr auto kMuchLess = std::chrono::seconds(20);
constexpr auto kMoreThanACommand = std::chrono::seconds(4);

// What a host's function throws: no std::exception.
struct HostsOwn {
  int number = 0;
};

struct Way {
  std::string name;
  std::string family;
  DWORD speed;
};

std::ostream& operator<<(std::ostream& out, const Way& way) { return out << way.name; }

class Download {
 protected:
  bed::SimulatedPort Port(std::vector<std::string> switches,
                          const std::map<std::string, std::string>& files) const {
    switches.insert(switches.begin(), {way_.family, "--speed", std::to_string(way_.speed)});
    return bed::SimulatedPort(switches, files);
  }
  rcvlink::Receiver Open(const bed::SimulatedPort& port) const { return OpenHpp(port, way_.speed); }
  rcvlink::Sink Collect() {
    return [this](std::span<const std::byte> bytes) {
      bytes_.append(reinterpret_cast<const char*>(bytes.data()), bytes.size());
    };
  }
  std::vector<std::string> LocalFiles() const {
    std::vector<std::string> names;
    for (const auto& entry : std::filesystem::directory_iterator(folder_.path())) {
      names.push_back(entry.path().filename().string());
    }
    return names;
  }
  std::filesystem::path Target() const { return folder_ / "copy.jps"; }

  Way way_{"Quorin", "quorin", CBR_115200};
  std::string bytes_;
  const bed::TempFolder folder_;
};

class HppDownload : public Download, public testing::Test {};

class HppDownloadOf : public Download, public testing::TestWithParam<Way> {
 protected:
  HppDownloadOf() { way_ = GetParam(); }

  // An abort that was left over does not end the next operation.
  void ExpectUsable(rcvlink::Receiver& receiver) {
    EXPECT_EQ(receiver.FindFile(L"b.jps").size, 1U);
  }
};

INSTANTIATE_TEST_SUITE_P(Ways,
                         HppDownloadOf,
                         testing::Values(Way{"Quorin", "quorin", CBR_115200},
                                         Way{"Velmar", "velmar", CBR_9600},
                                         Way{"VelmarAtFullSpeed", "velmar", CBR_115200}),
                         [](const auto& way) { return way.param.name; });

TEST_P(HppDownloadOf, GivesAFunctionTheBytes) {
  const auto port = Port({}, {{"a.jps", Content(kSize)}});
  auto receiver = Open(port);
  std::vector<int> percents;
  receiver.Download(receiver.FindFile(L"a.jps"), Collect(), {.progress = [&](int percent) {
                      percents.push_back(percent);
                    }});
  EXPECT_TRUE(bytes_ == Content(kSize));
  ASSERT_FALSE(percents.empty());
  EXPECT_EQ(percents.back(), 100);
  EXPECT_TRUE(std::ranges::is_sorted(percents));
}

TEST_P(HppDownloadOf, MakesAFile) {
  const auto port = Port({}, {{"a.jps", Content(kSize)}});
  auto receiver = Open(port);
  receiver.Download(receiver.FindFile(L"a.jps"), Target());
  EXPECT_EQ(folder_.Read("copy.jps"), Content(kSize));
  EXPECT_THAT(LocalFiles(), ElementsAre("copy.jps"));
}

// The library's result is S_OK.
TEST_P(HppDownloadOf, OfFewerBytesThanListedKeepsTheOldFile) {
  const auto port = Port({"--lie-size", "a.jps=6000"}, {{"a.jps", Content(kSize)}});
  auto receiver = Open(port);
  folder_.Write("copy.jps", "older");
  const File file = receiver.FindFile(L"a.jps");
  EXPECT_EQ(file.size, 6000U);
  try {
    receiver.Download(file, Target());
    FAIL();
  } catch (const std::system_error& error) {
    EXPECT_EQ(error.code(), Error::kOtherSize);
    EXPECT_EQ(std::string(error.what()),
              "download a.jps: 5000 of 6000 bytes: the byte count is not the size that the "
              "receiver lists");
  }
  EXPECT_EQ(folder_.Read("copy.jps"), "older");
  EXPECT_THAT(LocalFiles(), ElementsAre("copy.jps"));
}

// A log that has grown since it was listed.
TEST_P(HppDownloadOf, NeverGivesMoreThanListed) {
  const auto port = Port({}, {{"a.jps", Content(kSize)}, {"b.jps", "b"}});
  auto receiver = Open(port);
  EXPECT_EQ(CodeOf([&] { receiver.Download({.name = L"a.jps", .size = 3000}, Collect()); }),
            Error::kOtherSize);
  EXPECT_LE(bytes_.size(), 3000U);
  EXPECT_TRUE(Content(kSize).starts_with(bytes_));
  ExpectUsable(receiver);
}

TEST_P(HppDownloadOf, ThrowsWhatTheSinkThrows) {
  const auto port = Port({}, {{"a.jps", Content(kSize)}, {"b.jps", "b"}});
  auto receiver = Open(port);
  int calls = 0;
  const auto fail = [&](std::span<const std::byte>) {
    if (++calls == 2) throw HostsOwn{7};
  };
  try {
    receiver.Download({.name = L"a.jps", .size = kSize}, fail);
    FAIL();
  } catch (const HostsOwn& own) {
    EXPECT_EQ(own.number, 7);
  }
  EXPECT_EQ(calls, 2) << "it was called again after it had thrown";
  ExpectUsable(receiver);
}

TEST_P(HppDownloadOf, ThrowsWhatTheProgressFunctionThrows) {
  const auto port = Port({}, {{"a.jps", Content(kSize)}, {"b.jps", "b"}});
  auto receiver = Open(port);
  int calls = 0;
  const auto fail = [&](int percent) {
    ++calls;
    if (percent >= 20) throw HostsOwn{percent};
  };
  EXPECT_THROW(receiver.Download(
                   {.name = L"a.jps", .size = kSize}, Collect(), DownloadOptions{.progress = fail}),
               HostsOwn);
  const int calls_until_then = calls;
  EXPECT_LT(bytes_.size(), kSize);
  ExpectUsable(receiver);
  EXPECT_EQ(calls, calls_until_then);
}

TEST_P(HppDownloadOf, EndsWhenAStopIsRequested) {
  const auto port = Port({"--pieces", "600", "--piece-gap", "50"},
                         {{"a.jps", Content(kEndless)}, {"b.jps", "b"}});
  auto receiver = Open(port);
  std::stop_source source;
  folder_.Write("copy.jps", "older");
  auto download = host::OnThread([&] {
    return CodeOf([&] {
      receiver.Download(
          {.name = L"a.jps", .size = kEndless}, Target(), {.stop = source.get_token()});
    });
  });
  port.WaitForTranscript(way_.family == "quorin" ? " seq=5 " : " offset=5120 ");
  source.request_stop();
  ASSERT_EQ(download.wait_for(kMuchLess), std::future_status::ready);
  EXPECT_EQ(download.get(), Error::kCancelled);
  EXPECT_EQ(folder_.Read("copy.jps"), "older");
  EXPECT_THAT(LocalFiles(), ElementsAre("copy.jps"));
  ExpectUsable(receiver);
}

TEST_P(HppDownloadOf, EndsWhenItsOwnProgressRequestsTheStop) {
  const auto port = Port({}, {{"a.jps", Content(30000)}, {"b.jps", "b"}});
  auto receiver = Open(port);
  std::stop_source source;
  const auto stop_at_half = [&](int percent) {
    if (percent < 50) return;
    source.request_stop();
    std::this_thread::sleep_for(std::chrono::milliseconds(300));  // until the watch has seen it
  };
  EXPECT_EQ(CodeOf([&] {
              receiver.Download({.name = L"a.jps", .size = 30000},
                                Collect(),
                                {.progress = stop_at_half, .stop = source.get_token()});
            }),
            Error::kCancelled);
  EXPECT_LT(bytes_.size(), 30000U);
  ExpectUsable(receiver);
}

TEST_P(HppDownloadOf, EndsWhenTheReceiverIsSilent) {
  const bool quorin = way_.family == "quorin";
  const auto port = Port({quorin ? "--block-silence" : "--chunk-silence", "3:600@always"},
                         {{"a.jps", Content(kSize)}});
  auto receiver = Open(port);
  const auto start = std::chrono::steady_clock::now();
  EXPECT_EQ(CodeOf([&] {
              receiver.Download(
                  {.name = L"a.jps", .size = kSize}, Target(), {.silence = kMoreThanACommand});
            }),
            Error::kTimedOut);
  EXPECT_LT(std::chrono::steady_clock::now() - start, kMuchLess);
  EXPECT_THAT(LocalFiles(), IsEmpty());
}

TEST_P(HppDownloadOf, OfAMissingFileFails) {
  const auto port = Port({}, {{"b.jps", "b"}});
  auto receiver = Open(port);
  const std::error_code code =
      CodeOf([&] { receiver.Download({.name = L"none.jps", .size = 100}, Target()); });
  EXPECT_EQ(code, way_.family == "quorin" ? Error::kRefusedOrLost : Error::kOtherSize);
  EXPECT_THAT(LocalFiles(), IsEmpty());
  ExpectUsable(receiver);
}

TEST_P(HppDownloadOf, OfAnEmptyFileAsksNothing) {
  const auto port = Port({}, {{"a.jps", ""}});
  auto receiver = Open(port);
  const size_t before = port.Transcript().size();
  receiver.Download({.name = L"a.jps", .size = 0}, Target());
  EXPECT_EQ(port.Transcript().size(), before);
  EXPECT_EQ(folder_.Read("copy.jps"), "");
}

TEST_P(HppDownloadOf, SetsTheTimeThatIsListed) {
  using namespace std::chrono;
  const auto port = Port({}, {{"a.jps", Content(kSize)}});
  auto receiver = Open(port);
  File file = receiver.FindFile(L"a.jps");
  file.time = local_days(2024y / February / 29) + 23h + 59min + 58s + 7ms;
  receiver.Download(file, Target(), {.set_time = true});
  WIN32_FILE_ATTRIBUTE_DATA data{};
  ASSERT_TRUE(GetFileAttributesExW(Target().c_str(), GetFileExInfoStandard, &data));
  SYSTEMTIME time{};
  ASSERT_TRUE(FileTimeToSystemTime(&data.ftLastWriteTime, &time));
  EXPECT_EQ(rcvlink::detail::ToTime(time), file.time);
}

// The time in the host's own function is no silence of the receiver.
TEST_F(HppDownload, ASlowSinkIsNoSilence) {
  const auto port = Port({}, {{"a.jps", Content(100)}});
  auto receiver = Open(port);
  receiver.Download({.name = L"a.jps", .size = 100},
                    [&](std::span<const std::byte> bytes) {
                      std::this_thread::sleep_for(kMoreThanACommand + std::chrono::seconds(1));
                      Collect()(bytes);
                    },
                    {.silence = kMoreThanACommand});
  EXPECT_EQ(bytes_, Content(100));
}

TEST_F(HppDownload, OfMoreThanTheProtocolCanNumberIsRefusedAtOnce) {
  auto port = Port({}, {{"a.jps", "a"}});
  auto receiver = Open(port);
  EXPECT_EQ(CodeOf([&] { receiver.Download({.name = L"a.jps", .size = 33554433}, Target()); }),
            Error::kTooLarge);
  EXPECT_THAT(LocalFiles(), IsEmpty());
  port.Stop();  // only then the last line is recorded
  EXPECT_THAT(port.Transcript(), testing::Not(HasSubstr("a.jps")));
}

TEST_F(HppDownload, ReplacesAnOlderFileWhenAllBytesAreHere) {
  const auto port = Port({}, {{"a.jps", Content(kSize)}});
  auto receiver = Open(port);
  folder_.Write("copy.jps", "older");
  folder_.Write("copy.jps.part", "of a host that was killed");
  bool kept_until_then = true;
  receiver.Download({.name = L"a.jps", .size = kSize}, Target(), {.progress = [&](int) {
                      kept_until_then = kept_until_then && folder_.Read("copy.jps") == "older";
                    }});
  EXPECT_TRUE(kept_until_then);
  EXPECT_EQ(folder_.Read("copy.jps"), Content(kSize));
  EXPECT_THAT(LocalFiles(), ElementsAre("copy.jps"));
}

TEST_F(HppDownload, IntoAMissingFolderSendsNothing) {
  const auto port = Port({}, {{"a.jps", Content(kSize)}});
  auto receiver = Open(port);
  const size_t before = port.Transcript().size();
  EXPECT_EQ(CodeOf([&] {
              receiver.Download({.name = L"a.jps", .size = kSize}, folder_ / "none" / "copy.jps");
            }),
            std::errc::no_such_file_or_directory);
  EXPECT_EQ(port.Transcript().size(), before);
}

TEST_F(HppDownload, ThatCannotBeRenamedIsKept) {
  const auto port = Port({}, {{"a.jps", Content(kSize)}});
  auto receiver = Open(port);
  std::filesystem::create_directory(Target());
  EXPECT_EQ(CodeOf([&] { receiver.Download({.name = L"a.jps", .size = kSize}, Target()); }),
            std::errc::permission_denied);
  EXPECT_EQ(folder_.Read("copy.jps.part"), Content(kSize));
}

TEST_F(HppDownload, IntoOneFileFromTwoThreadsIsRefused) {
  const auto port = Port({"--pace"}, {{"a.jps", Content(kSize)}});
  auto receiver = Open(port);
  host::Gate gate;
  auto first = host::OnThread([&] {
    return CodeOf([&] {
      receiver.Download(
          {.name = L"a.jps", .size = kSize}, Target(), {.progress = [&](int) { gate.Pass(); }});
    });
  });
  ASSERT_TRUE(gate.WaitForArrival());
  EXPECT_EQ(CodeOf([&] { receiver.Download({.name = L"a.jps", .size = kSize}, Target()); }),
            std::errc::permission_denied);
  gate.Open();
  EXPECT_EQ(first.get(), std::error_code());
  EXPECT_EQ(folder_.Read("copy.jps"), Content(kSize));
}

// The abort is for the own operation and not for that of another thread.
TEST_F(HppDownload, AStopWhileItWaitsDoesNotEndTheOtherOne) {
  const auto port = Port({}, {{"a.jps", Content(kSize)}, {"b.jps", "b"}});
  auto receiver = Open(port);
  host::Gate gate;
  auto first = host::OnThread([&] {
    return CodeOf([&] {
      receiver.Download({.name = L"a.jps", .size = kSize}, Target(), {.progress = [&](int percent) {
                          if (percent >= 30) gate.Pass();
                        }});
    });
  });
  ASSERT_TRUE(gate.WaitForArrival());
  std::stop_source source;
  auto second = host::OnThread([&] {
    return CodeOf([&] {
      receiver.Download({.name = L"b.jps", .size = 1},
                        Collect(),
                        {.stop = source.get_token(), .silence = std::chrono::milliseconds(200)});
    });
  });
  // Its time of silence passes, too.
  EXPECT_EQ(second.wait_for(std::chrono::seconds(1)), std::future_status::timeout);
  source.request_stop();
  EXPECT_EQ(second.get(), Error::kCancelled);
  gate.Open();
  EXPECT_EQ(first.get(), std::error_code());
  EXPECT_EQ(folder_.Read("copy.jps"), Content(kSize));
}

TEST_F(HppDownload, LeavesNoHandle) {
  const auto port = Port({}, {{"a.jps", Content(1000)}});
  auto receiver = Open(port);
  std::stop_source source;
  const auto use = [&] {
    receiver.Download({.name = L"a.jps", .size = 1000}, Target(), {.stop = source.get_token()});
    EXPECT_NE(CodeOf([&] { receiver.Download({.name = L"a.jps", .size = 999}, Target()); }),
              std::error_code());
    EXPECT_THROW(receiver.Download({.name = L"a.jps", .size = 1000},
                                   [](std::span<const std::byte>) { throw HostsOwn{}; }),
                 HostsOwn);
  };
  constexpr int kFirstTimes = 2;
  for (int i = 0; i < kFirstTimes; ++i) use();
  const size_t handles = HandleCount();
  constexpr int kTimes = 3;
  for (int i = 0; i < kTimes; ++i) use();
  EXPECT_EQ(HandleCount(), handles);
}

TEST(HppDownloadOverUsb, GivesAFunctionTheBytesOrThrows) {
  const bed::SimulatedUsb usb({"quorin"}, {{"a.jps", Content(kSize)}});
  auto receiver = rcvlink::Receiver::Find(usb.device());
  std::string bytes;
  const auto collect = [&](std::span<const std::byte> piece) {
    bytes.append(reinterpret_cast<const char*>(piece.data()), piece.size());
  };
  receiver.Download(receiver.FindFile(L"a.jps"), collect);
  EXPECT_TRUE(bytes == Content(kSize));
  // The result is that of the stream.
  EXPECT_THROW(receiver.Download({.name = L"a.jps", .size = kSize},
                                 [](std::span<const std::byte>) { throw HostsOwn{}; }),
               HostsOwn);
  EXPECT_EQ(CodeOf([&] { receiver.Download({.name = L"a.jps", .size = 3000}, collect); }),
            Error::kOtherSize);
}

}  // namespace
