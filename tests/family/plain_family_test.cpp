// A third family, from discovery to a download: what docs/adding-a-family.md shows.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <iterator>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "api/discovery.h"
#include "platform/handle.h"
#include "platform/hresult.h"
#include "platform/text.h"
#include "tests/family/plain_protocol.h"
#include "tests/host/support/file_list.h"
#include "tests/support/memory_stream.h"
#include "tests/support/report_capture.h"
#include "tests/support/scripted_connection.h"

using rcvlink::FamilyOf;
using rcvlink::OnUsb;
using rcvlink::UniqueBstr;

using testing::Contains;

namespace {

constexpr auto kPlain = static_cast<EProtocol>(3);
constexpr wchar_t kPort[] = L"COM7";

// The receiver's side: a receiver with one file.
std::string AnswerTo(std::string_view line) {
  if (line == "who\n") return "plain\n.\n";
  if (line == "id\n") return "P1\n.\n";
  if (line == "list\n") return "6 a.txt\n.\n";
  if (line == "get a.txt\n") return "hello\n.\n";
  return "";
}

std::unique_ptr<ScriptedConnection> PlainReceiver() {
  auto connection = std::make_unique<ScriptedConnection>();
  connection->on_write = [receiver = connection.get()](std::string_view line) {
    if (const std::string answer = AnswerTo(line); !answer.empty()) receiver->GiveRead(answer);
    return S_OK;
  };
  return connection;
}

class PlainFamily : public testing::Test {
 protected:
  // Asks all families, the Plain one last.
  HRESULT Find(std::unique_ptr<CIConnection> connection) {
    std::vector<rcvlink::Family> families(rcvlink::kFamilies.begin(), rcvlink::kFamilies.end());
    families.push_back(FamilyOf<CPlainProtocol>(kPlain, L"Plain", OnUsb::kNo));
    return rcvlink::FindReceiver(
        families, {L"Find", kPort, nullptr}, std::move(connection), &receiver);
  }
  ~PlainFamily() override {
    if (receiver) devapi::CloseReceiver(receiver);
  }

  const ReportCapture report;
  void* receiver = nullptr;
};

TEST_F(PlainFamily, IsFoundAfterTheOthers) {
  ASSERT_EQ(Find(PlainReceiver()), S_OK);
  EXPECT_THAT(report.Lines(), Contains("Find - looking for Velmar receiver [COM7]"));
  EXPECT_THAT(report.Lines(), Contains("Find - Plain receiver found [COM7]"));
}

TEST_F(PlainFamily, IsNotFoundWithoutAnAnswer) {
  EXPECT_EQ(Find(std::make_unique<ScriptedConnection>()), S_FALSE);
  EXPECT_EQ(receiver, nullptr);
}

TEST_F(PlainFamily, ReportsItsIdentity) {
  ASSERT_EQ(Find(PlainReceiver()), S_OK);
  CReceiverInfo info{};
  ASSERT_EQ(devapi::GetReceiverInfo(receiver, nullptr, &info), S_OK);
  const UniqueBstr id(info.bstrReceiverId);
  const UniqueBstr model(info.bstrModel);
  EXPECT_STREQ(id.get(), L"P1\n");
  EXPECT_STREQ(model.get(), L"Plain");
}

TEST_F(PlainFamily, ListsAndDownloads) {
  ASSERT_EQ(Find(PlainReceiver()), S_OK);
  const host::FileList list(receiver);
  ASSERT_EQ(list.Count(), 1);
  std::wstring name = list.At(0).name;
  EXPECT_EQ(name, L"a.txt");
  EXPECT_EQ(list.At(0).info.dwSize, 6U);
  MemoryStream stream;
  EXPECT_EQ(devapi::DownloadFile(receiver, name.data(), &stream, nullptr), S_OK);
  EXPECT_EQ(stream.bytes, "hello\n");
}

TEST_F(PlainFamily, OffersNothingElse) {
  ASSERT_EQ(Find(PlainReceiver()), S_OK);
  std::wstring name = L"a.txt";
  EXPECT_EQ(devapi::DeleteFileW(receiver, name.data()), E_NOTIMPL);
  EXPECT_EQ(devapi::DCSetRcvBaudrate(receiver, CBR_9600), E_NOTIMPL);
}

}  // namespace
