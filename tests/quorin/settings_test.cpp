#include "quorin/settings.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "tests/support/report_capture.h"
#include "tests/support/user_settings.h"

using rcvlink::ReadDownloadReadTimeout;

using testing::ElementsAre;

namespace {

class QuorinSettings : public testing::Test {
 protected:
  UserSettings settings;
  const ReportCapture report;
};

TEST_F(QuorinSettings, AreThirtySecondsWithoutTheKey) {
  EXPECT_EQ(ReadDownloadReadTimeout(), 30000U);
  EXPECT_THAT(report.Lines(), ElementsAre());
}

TEST_F(QuorinSettings, AreThirtySecondsWithoutTheValue) {
  const DWORD value = 1234;
  settings.SetValue(L"Another", REG_DWORD, &value, sizeof(value));
  EXPECT_EQ(ReadDownloadReadTimeout(), 30000U);
  EXPECT_THAT(report.Lines(), ElementsAre());
}

TEST_F(QuorinSettings, AreTheValueAndAreTraced) {
  const DWORD value = 4000000000;
  settings.SetValue(L"DownloadReadTimeout", REG_DWORD, &value, sizeof(value));
  EXPECT_EQ(ReadDownloadReadTimeout(), 4000000000U);
  EXPECT_THAT(report.Lines(),
              ElementsAre("CQuorinProtocol::CQuorinProtocol - file download read timeout "
                          "/DownloadReadTimeout/ - 4000000000"));
}

TEST_F(QuorinSettings, OfAnotherTypeAreTakenWithoutATrace) {
  const DWORD value = 1234;
  settings.SetValue(L"DownloadReadTimeout", REG_BINARY, &value, sizeof(value));
  EXPECT_EQ(ReadDownloadReadTimeout(), 1234U);
  EXPECT_THAT(report.Lines(), ElementsAre());
}

TEST_F(QuorinSettings, ThatDoNotFitAreNotTraced) {
  const wchar_t text[] = L"12345678";
  settings.SetValue(L"DownloadReadTimeout", REG_SZ, text, sizeof(text));
  EXPECT_EQ(ReadDownloadReadTimeout(), 30000U);
  EXPECT_THAT(report.Lines(), ElementsAre());
}

}  // namespace
