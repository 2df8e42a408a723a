// rcvlink.hpp: owners, plain values and exceptions. Downloads are in hpp_download_test.cpp.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <chrono>
#include <random>
#include <set>
#include <stop_token>
#include <string>
#include <thread>
#include <vector>

#include "tests/host/support/hpp.h"
#include "tests/host/support/lock.h"
#include "tests/host/support/report.h"
#include "tests/support/content.h"
#include "tests/support/resources.h"

using host::CodeOf;
using host::OpenHpp;
using host::TryLockElsewhere;
using rcvlink::Error;
using rcvlink::File;
using testing::ElementsAre;
using testing::EndsWith;
using testing::HasSubstr;
using testing::IsEmpty;

namespace {

std::vector<std::wstring> NamesOf(const std::vector<File>& files) {
  std::vector<std::wstring> names;
  for (const File& file : files) names.push_back(file.name);
  return names;
}

std::stop_token Stopped() {
  std::stop_source source;
  source.request_stop();
  return source.get_token();
}

// --- Errors

TEST(HppErrors, EachCodeOfTheHeaderHasItsText) {
  std::set<std::string> texts;
  const unsigned codes[] = {0,
                            1,
                            0x80070057,
                            0x8007000E,
                            0x80004001,
                            0x80004005,
                            0x8000FFFF,
                            0x8007048F,
                            0x800705B4,
                            0x80070002,
                            0x8007000D,
                            0x800700DF,
                            0x800704C7,
                            0x80070005};
  for (const unsigned code : codes) {
    const std::string text = rcvlink::Category().message(static_cast<int>(code));
    EXPECT_THAT(text, testing::Not(HasSubstr("0x"))) << "it has no text of its own";
    EXPECT_TRUE(texts.insert(text).second) << text;
  }
}

TEST(HppErrors, OtherCodesAreNamed) {
  const auto text = [](unsigned code) {
    return rcvlink::Category().message(static_cast<int>(code));
  };
  EXPECT_EQ(text(0xE0001009), "0xE0001009, an error of the USBIO driver");
  const std::string of_windows = text(0x80070006);  // invalid handle
  EXPECT_THAT(of_windows, testing::StartsWith("0x80070006, "));
  EXPECT_GT(of_windows.size(), std::string("0x80070006, ").size());
  EXPECT_THAT(of_windows, testing::Not(EndsWith("\n")));
  EXPECT_EQ(text(0x8007FFFE), "0x8007FFFE");
}

TEST(HppErrors, CompareWithThoseOfTheStandardLibrary) {
  EXPECT_TRUE(make_error_code(Error::kTimedOut) == std::errc::timed_out);
  EXPECT_TRUE(make_error_code(Error::kCancelled) == std::errc::operation_canceled);
  EXPECT_TRUE(make_error_code(Error::kNotFound) == std::errc::no_such_file_or_directory);
  EXPECT_TRUE(make_error_code(Error::kNotOffered) == std::errc::not_supported);
  EXPECT_FALSE(make_error_code(Error::kRefusedOrLost) == std::errc::timed_out);
}

// --- Finding

TEST(HppFind, FindsReceiversOfBothFamilies) {
  const bed::SimulatedPort quorin({"quorin", "--id", "QU7", "--model", "QR9"});
  const bed::SimulatedPort velmar({"velmar", "--id", "VM7", "--model", "VR9"});
  auto first = rcvlink::Receiver::Find(quorin.name());
  auto second = rcvlink::Receiver::Find(velmar.name(), {.family = eProtocolVelmar});
  EXPECT_EQ(first.Family(), eProtocolQuorin);
  EXPECT_EQ(second.Family(), eProtocolVelmar);
  const rcvlink::Identity identity = first.Identify();
  EXPECT_EQ(identity.id, L"QU7");
  EXPECT_EQ(identity.model, L"QR9");
  EXPECT_EQ(identity.family, eProtocolQuorin);
  EXPECT_EQ(identity.features, 9U);
  EXPECT_EQ(second.Identify().id, L"VM7");
  EXPECT_EQ(second.Identify().variant, 2U);
}

// The family is known without a question.
TEST(HppFind, FamilyAsksNothing) {
  const bed::SimulatedPort quorin({"quorin"});
  const host::Receiver receiver(quorin);
  const host::Velmar velmar({});
  const rcvlink::Receiver first(host::SecondUser(quorin));
  const rcvlink::Receiver second(host::SecondUser(velmar.port));
  EXPECT_EQ(first.Family(), eProtocolQuorin);
  EXPECT_EQ(second.Family(), eProtocolVelmar);
  EXPECT_THAT(receiver.SentSince(), IsEmpty());
  EXPECT_THAT(velmar.Sent(), IsEmpty());
}

TEST(HppFind, MissingPort) {
  const bed::PortLease lease;
  const std::wstring name(lease.name().begin(), lease.name().end());
  try {
    rcvlink::Receiver::Find(name);
    FAIL();
  } catch (const std::system_error& error) {
    EXPECT_EQ(error.code(), Error::kNotFound);
    EXPECT_EQ(error.code().value(), host::kFileNotFound);
    EXPECT_EQ(std::string(error.what()),
              "find a receiver on " + lease.name() + ": it does not exist");
  }
}

TEST(HppFind, OfAnotherFamilyGivesNoResult) {
  const bed::SimulatedPort port({"velmar"});
  EXPECT_EQ(CodeOf([&] {
              rcvlink::Receiver::FindAt(
                  port.name(), host::Settings(CBR_9600), {.family = eProtocolQuorin});
            }),
            Error::kNoResult);
}

TEST(HppFind, AStopEndsTheSearch) {
  const bed::SimulatedPort port({"quorin", "--mute", "*"});
  std::stop_source source;
  auto search = host::OnThread([&] {
    return CodeOf([&] { rcvlink::Receiver::Find(port.name(), {.stop = source.get_token()}); });
  });
  port.WaitForTranscript("> dm");
  source.request_stop();
  ASSERT_EQ(search.wait_for(std::chrono::seconds(20)), std::future_status::ready);
  EXPECT_EQ(search.get(), Error::kCancelled);
}

TEST(HppFind, AStopThatWasRequestedBeforeSendsNothing) {
  const bed::SimulatedPort port({"quorin"});
  EXPECT_EQ(CodeOf([&] { rcvlink::Receiver::Find(port.name(), {.stop = Stopped()}); }),
            Error::kCancelled);
  EXPECT_THAT(host::SentByHost(port.Transcript()), IsEmpty());
}

TEST(HppFind, ClosesTheReceiverOnce) {
  const bed::SimulatedPort port({"quorin"});
  std::wstring name = port.name();
  void* registered = nullptr;
  {
    auto receiver = rcvlink::Receiver::Find(name);
    rcvlink::Receiver moved = std::move(receiver);
    EXPECT_EQ(receiver.handle(), nullptr);
    EXPECT_TRUE(moved.Answers());
  }
  EXPECT_EQ(devapi::OpenReceiver(name.data(), &registered), S_FALSE) << "it is still open";
}

TEST(HppReceiver, ThatWasMovedFromIsAnInvalidArgument) {
  const bed::SimulatedPort port({"quorin"});
  auto receiver = OpenHpp(port);
  const auto moved = std::move(receiver);
  EXPECT_EQ(CodeOf([&] { receiver.Files(); }), std::errc::invalid_argument);
}

// --- Identity and lock

TEST(HppIdentify, ThatFailsLeavesAQuorinReceiverFree) {
  const bed::SimulatedPort port({"quorin", "--refuse", "print,/par/rcvid"});
  auto receiver = OpenHpp(port);
  EXPECT_EQ(CodeOf([&] { receiver.Identify(); }), Error::kRefusedOrLost);
  EXPECT_EQ(TryLockElsewhere(receiver.handle()), S_OK);
}

template <typename Port>
void ExpectHostsLockStays(const Port& port) {
  auto receiver = OpenHpp(port);
  {
    const rcvlink::Lock lock(receiver);
    EXPECT_NE(CodeOf([&] { receiver.Identify(); }), std::error_code());
    EXPECT_EQ(TryLockElsewhere(receiver.handle()), S_FALSE) << "it released the host's lock";
  }
  EXPECT_EQ(TryLockElsewhere(receiver.handle()), S_OK) << "it kept a lock";
}

TEST(HppIdentify, ThatFailsKeepsTheHostsOwnLock) {
  ExpectHostsLockStays(bed::SimulatedPort({"quorin", "--refuse", "print,/par/rcvid"}));
  ExpectHostsLockStays(bed::SimulatedPort({"velmar", "--refuse", "log versiona"}));
}

TEST(HppLock, HoldsTheReceiver) {
  const bed::SimulatedPort port({"quorin"});
  auto receiver = OpenHpp(port);
  {
    rcvlink::Lock first(receiver);
    const rcvlink::Lock second = std::move(first);
    EXPECT_EQ(TryLockElsewhere(receiver.handle()), S_FALSE);
    EXPECT_TRUE(receiver.Answers());
  }
  EXPECT_EQ(TryLockElsewhere(receiver.handle()), S_OK);
}

TEST(HppLock, AStopEndsTheWait) {
  const bed::SimulatedPort port({"quorin"});
  auto receiver = OpenHpp(port);
  const rcvlink::Lock lock(receiver);
  std::stop_source source;
  auto waiting =
      host::OnThread([&] { return CodeOf([&] { receiver.Files(source.get_token()); }); });
  source.request_stop();
  EXPECT_EQ(waiting.get(), Error::kCancelled);
}

// Also at the moment at which the call ends.
TEST(HppLock, AStopMayComeAtAnyMoment) {
  const bed::SimulatedPort port({"quorin"});
  auto receiver = OpenHpp(port);
  constexpr int kTimes = 2000;
  constexpr unsigned kLongestMicroseconds = 400;  // that a lock and its end take
  std::minstd_rand random(1);
  for (int i = 0; i < kTimes; ++i) {
    std::stop_source source;
    const auto moment = std::chrono::steady_clock::now() +
                        std::chrono::microseconds(random() % kLongestMicroseconds);
    const std::jthread other([&] {
      while (std::chrono::steady_clock::now() < moment) std::this_thread::yield();
      source.request_stop();
    });
    const std::error_code code =
        CodeOf([&] { const rcvlink::Lock lock(receiver, source.get_token()); });
    EXPECT_TRUE(!code || code == Error::kCancelled) << code.message();
  }
  EXPECT_EQ(TryLockElsewhere(receiver.handle()), S_OK);
}

TEST(HppLock, OfAThreadThatEndedIsTakenOver) {
  const bed::SimulatedPort port({"quorin"});
  auto receiver = OpenHpp(port);
  host::OnThread([&] { return devapi::LockConnection(receiver.handle(), nullptr); }).get();
  SetLastError(ERROR_INVALID_PARAMETER);  // the library gives what it finds here
  {
    const rcvlink::Lock lock(receiver);
    EXPECT_EQ(TryLockElsewhere(receiver.handle()), S_FALSE);
  }
  EXPECT_EQ(TryLockElsewhere(receiver.handle()), S_OK);
}

// --- Files

void SetModified(const std::filesystem::path& path, const SYSTEMTIME& time) {
  FILETIME modified{};
  ASSERT_TRUE(SystemTimeToFileTime(&time, &modified));
  const bed::UniqueHandle file(CreateFileW(
      path.c_str(), FILE_WRITE_ATTRIBUTES, FILE_SHARE_READ, nullptr, OPEN_EXISTING, 0, nullptr));
  EXPECT_TRUE(SetFileTime(file.get(), nullptr, nullptr, &modified)) << path;
}

TEST(HppFiles, HaveNamesSizesAndTimes) {
  using namespace std::chrono;
  const bed::TempFolder folder;
  folder.Write("A.log", Content(1025));
  SetModified(folder / "A.log", {2024, 2, 0, 29, 23, 59, 58, 0});
  const bed::SimulatedPort port({"velmar", "--folder", folder.unix_path()});
  auto receiver = OpenHpp(port);
  const std::vector<File> files = receiver.Files();
  ASSERT_EQ(files.size(), 1U);
  EXPECT_EQ(files[0].name, L"A.log");
  EXPECT_EQ(files[0].size, 1025U);
  EXPECT_EQ(files[0].time, local_days(2024y / February / 29) + 23h + 59min + 58s);
}

TEST(HppFiles, TimesThatWindowsDoesNotHaveAreNone) {
  EXPECT_EQ(rcvlink::detail::ToTime(SYSTEMTIME{}), std::nullopt);
  EXPECT_EQ(rcvlink::detail::ToTime(SYSTEMTIME{1600, 12, 0, 31, 0, 0, 0, 0}), std::nullopt);
  EXPECT_NE(rcvlink::detail::ToTime(SYSTEMTIME{1601, 1, 0, 1, 0, 0, 0, 0}), std::nullopt);
}

TEST(HppFiles, OneIsFoundByItsName) {
  const bed::SimulatedPort port({"quorin"}, {{"A.log", "a"}, {"B.log", "bb"}});
  auto receiver = OpenHpp(port);
  EXPECT_EQ(receiver.FindFile(L"B.log").size, 2U);
  EXPECT_EQ(CodeOf([&] { receiver.FindFile(L"b.log"); }), Error::kNotFound);
}

TEST(HppFiles, ARefusalOfAQuorinReceiverIsThrown) {
  const bed::SimulatedPort port({"quorin", "--refuse", "print,/log"});
  auto receiver = OpenHpp(port);
  EXPECT_EQ(CodeOf([&] { receiver.Files(); }), Error::kRefusedOrLost);
}

TEST(HppFiles, AnEmptyListOfAVelmarReceiverIsReadTwice) {
  const bed::SimulatedPort port({"velmar", "--refuse", "log direnta@1"}, {{"A.log", "a"}});
  auto receiver = OpenHpp(port);
  EXPECT_THAT(NamesOf(receiver.Files()), ElementsAre(L"A.log"));
}

TEST(HppFiles, OfAVelmarReceiverWithoutFilesAreNone) {
  const bed::SimulatedPort port({"velmar"});
  auto receiver = OpenHpp(port);
  EXPECT_THAT(receiver.Files(), IsEmpty());
}

// Takes the library's 30 s, and those of the check.
TEST(HppFiles, OfAVelmarReceiverThatIsSilentTimeOut) {
  bed::SimulatedPort port({"velmar"}, {{"A.log", "a"}});
  auto receiver = OpenHpp(port);
  port.Pause();
  EXPECT_EQ(CodeOf([&] { receiver.Files(); }), Error::kTimedOut);
  port.Resume();
}

TEST(HppFiles, TheEndOfALongVelmarListIsAwaited) {
  std::map<std::string, std::string> files;
  for (int i = 100; i < 180; ++i) files["file" + std::to_string(i) + ".log"] = "x";
  // No answer to the first command of a search: the purge before the second one may take its first bytes.
  const bed::SimulatedPort port({"velmar", "--pace", "--mute", "interfacemode"}, files);
  auto receiver = OpenHpp(port);
  const size_t listed = receiver.Files().size();
  EXPECT_GT(listed, 40U);
  EXPECT_LT(listed, files.size()) << "the list was not cut";
  EXPECT_EQ(receiver.Identify().id, L"VM00731") << "the next command met the end of the list";
}

// The library's table of lists may not be used by two threads at once: the second waits.
TEST(HppFiles, AreListedFromOneReceiverAtATime) {
  const bed::SimulatedPort slow({"quorin", "--reply-silence", "600:print,/log@1"},
                                {{"A.log", "a"}});
  const bed::SimulatedPort port({"quorin"}, {{"B.log", "b"}});
  const host::Receiver raw(port);
  auto first = OpenHpp(slow);
  rcvlink::Receiver second(host::SecondUser(port));
  std::stop_source stop_of_first;
  std::stop_source stop_of_second;
  const auto list = [](rcvlink::Receiver& receiver, std::stop_source& source) {
    return host::OnThread([&] { return CodeOf([&] { receiver.Files(source.get_token()); }); });
  };
  auto of_first = list(first, stop_of_first);
  slow.WaitForTranscript("print,/log");
  auto of_second = list(second, stop_of_second);
  EXPECT_EQ(of_second.wait_for(std::chrono::seconds(1)), std::future_status::timeout);
  EXPECT_THAT(raw.SentSince(), IsEmpty());
  stop_of_second.request_stop();
  EXPECT_EQ(of_second.get(), Error::kCancelled);
  stop_of_first.request_stop();
  EXPECT_EQ(of_first.get(), Error::kCancelled);
  EXPECT_THAT(NamesOf(second.Files()), ElementsAre(L"B.log"));
}

TEST(HppFiles, AStopEndsTheReading) {
  const bed::SimulatedPort port({"quorin", "--reply-silence", "600:print,/log@1"},
                                {{"A.log", "a"}});
  auto receiver = OpenHpp(port);
  std::stop_source source;
  auto reading =
      host::OnThread([&] { return CodeOf([&] { receiver.Files(source.get_token()); }); });
  port.WaitForTranscript("print,/log");
  source.request_stop();
  ASSERT_EQ(reading.wait_for(std::chrono::seconds(10)), std::future_status::ready);
  EXPECT_EQ(reading.get(), Error::kCancelled);
}

TEST(HppAnswers, SaysWhetherAReceiverDoes) {
  bed::SimulatedPort port({"quorin"});
  auto receiver = OpenHpp(port);
  EXPECT_TRUE(receiver.Answers());
  port.Stop();
  EXPECT_FALSE(receiver.Answers());
  EXPECT_EQ(CodeOf([&] { receiver.Answers(Stopped()); }), Error::kCancelled);
}

TEST(HppDelete, DeletesOrThrows) {
  const bed::SimulatedPort quorin({"quorin", "--refuse", "remove,A.log"},
                                  {{"A.log", "a"}, {"B.log", "b"}});
  const bed::SimulatedPort velmar({"velmar", "--refuse", "del file A.log"},
                                  {{"A.log", "a"}, {"B.log", "b"}});
  for (const bed::SimulatedPort* port : {&quorin, &velmar}) {
    auto receiver = OpenHpp(*port);
    EXPECT_EQ(CodeOf([&] { receiver.Delete(L"A.log"); }), Error::kRefusedOrLost);
    receiver.Delete(L"B.log");
    EXPECT_THAT(NamesOf(receiver.Files()), ElementsAre(L"A.log"));
  }
}

// A Quorin receiver reports its refusals: the directory is not read.
TEST(HppDelete, AsksAQuorinReceiverNothingMore) {
  const bed::SimulatedPort port({"quorin"}, {{"A.log", "a"}});
  const host::Receiver open(port);
  rcvlink::Receiver receiver(host::SecondUser(port));
  receiver.Delete(L"A.log");
  EXPECT_THAT(open.SentSince(), ElementsAre(R"(%#%remove,A.log\r\n)"));
}

TEST(HppRename, RenamesOrThrows) {
  const bed::SimulatedPort velmar({"velmar", "--refuse", "rename A.log"},
                                  {{"A.log", "a"}, {"B.log", "b"}});
  auto receiver = OpenHpp(velmar);
  EXPECT_EQ(CodeOf([&] { receiver.Rename(L"A.log", L"C.log"); }), Error::kRefusedOrLost);
  receiver.Rename(L"B.log", L"C.log");
  EXPECT_THAT(NamesOf(receiver.Files()), testing::UnorderedElementsAre(L"A.log", L"C.log"));

  const bed::SimulatedPort quorin({"quorin"}, {{"A.log", "a"}});
  auto other = OpenHpp(quorin);
  EXPECT_EQ(CodeOf([&] { other.Rename(L"A.log", L"C.log"); }), Error::kNotOffered);
}

TEST(HppSettings, AreThoseOfTheFamily) {
  const bed::SimulatedPort quorin({"quorin"});
  const host::Receiver raw(quorin);
  rcvlink::Receiver receiver(host::SecondUser(quorin));
  receiver.SetParity(rcvlink::Parity::kOdd);
  receiver.SetStopBits(2);
  receiver.SetParity(rcvlink::Parity::kEven);
  receiver.SetStopBits(1);
  const auto sent = raw.SentSince();
  EXPECT_THAT(sent,
              testing::AllOf(testing::Contains(HasSubstr("parity,odd")),
                             testing::Contains(HasSubstr("parity,even"))));

  const host::Velmar velmar({});
  rcvlink::Receiver other(host::SecondUser(velmar.port));
  const char* const question = R"(log comconfiga once\r)";
  other.SetParity(rcvlink::Parity::kEven);
  other.SetStopBits(2);
  other.SetParity(rcvlink::Parity::kOdd);
  other.SetBaudRate(CBR_19200);
  EXPECT_THAT(velmar.Sent(),
              ElementsAre(question,
                          R"(COM 9600 E 8 1 N\r)",
                          question,
                          R"(COM 9600 E 8 2 N\r)",
                          question,
                          R"(COM 9600 O 8 2 N\r)",
                          question,
                          R"(COM 19200 O 8 2 N\r)"));
  EXPECT_EQ(CodeOf([&] { other.SetRts(true); }), Error::kNotOffered);
}

TEST(HppReport, HasTheLinesOfTheHost) {
  const std::wstring name = host::NewReportName();
  {
    rcvlink::Report report(name);
    report.Write(L"100 %s of it");
  }
  EXPECT_THAT(host::ReadReport(host::ReportPath(name)), HasSubstr("100 %s of it\r\n"));
  EXPECT_TRUE(::DeleteFileW(host::ReportPath(name).c_str())) << "the report is still open";
}

// --- What is left

TEST(HppManyTimes, LeaveNoHandleAndNoMemory) {
  const std::string longest(200, 'x');
  const bed::SimulatedPort port({"quorin", "--id", longest, "--refuse", "remove"},
                                {{"A.log", Content(100)}});
  auto receiver = OpenHpp(port);
  std::stop_source source;
  const auto use = [&] {
    receiver.Identify(source.get_token());
    receiver.Files(source.get_token());
    EXPECT_NE(CodeOf([&] { receiver.Delete(L"A.log"); }), std::error_code());
    EXPECT_NE(CodeOf([&] { receiver.Files(Stopped()); }), std::error_code());
    EXPECT_NE(CodeOf([&] { receiver.FindFile(L"none"); }), std::error_code());
    rcvlink::Receiver second(host::SecondUser(port));
  };
  constexpr int kFirstTimes = 2;
  for (int i = 0; i < kFirstTimes; ++i) use();
  const size_t handles = HandleCount();
  const size_t bytes = HeapBytes();
  constexpr int kTimes = 3;
  for (int i = 0; i < kTimes; ++i) use();
  EXPECT_EQ(HandleCount(), handles);
  // A list or a string that is lost each time has more.
  constexpr size_t kLessThanOneEachTime = 100 * kTimes;
  EXPECT_LT(HeapBytes(), bytes + kLessThanOneEachTime);
}

}  // namespace
