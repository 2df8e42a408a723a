// A copy of the library under another name, loaded and unloaded by the test.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <algorithm>
#include <string>
#include <vector>

#include "tests/host/support/library_copy.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"
#include "tests/support/resources.h"

using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;

namespace {

TEST(ApiModule, LoadLineIsInNoReport) {
  const host::Report report;
  host::LibraryCopy copy;
  ASSERT_TRUE(copy.Load());
  const std::wstring name = host::NewReportName();
  copy.CreateReport(name);
  copy.Unload();

  const std::string text = host::ReadReport(host::ReportPath(name));
  EXPECT_THAT(text, testing::EndsWith("Bye!\r\n"));
  EXPECT_THAT(text, Not(HasSubstr("Module is loaded")));
  EXPECT_TRUE(report.Lines().empty()) << "the copy wrote into the report of the original";
  DeleteFileW(host::ReportPath(name).c_str());
}

TEST(ApiModule, WritesByeInItsReportOnly) {
  const std::wstring name = host::NewReportName();
  host::LibraryCopy copy;
  ASSERT_TRUE(copy.Load());
  copy.CreateReport(name);
  copy.Unload();
  EXPECT_THAT(host::ReportLines(host::ReportPath(name)), ElementsAre("Bye!"));
  DeleteFileW(host::ReportPath(name).c_str());
}

class ApiModuleWithReceiver : public testing::Test {
 protected:
  // Loads a copy, opens a receiver through it, and unloads it. Gives the number of handles that
  // stay open.
  long LoadAndUnload() {
    DeleteFileW(path_.c_str());
    const size_t before = HandleCount();
    {
      host::LibraryCopy copy;
      EXPECT_TRUE(copy.Load());
      copy.CreateReport(name_);
      void* handle = nullptr;
      EXPECT_EQ(copy.CreateReceiver(port_.name(), &handle), S_OK);
    }
    return static_cast<long>(HandleCount()) - static_cast<long>(before);
  }

  const bed::SimulatedPort port_{{"quorin"}};
  const std::wstring name_ = host::NewReportName();
  const std::wstring path_ = host::ReportPath(name_);
};

TEST_F(ApiModuleWithReceiver, ClosesItWhenUnloaded) {
  LoadAndUnload();  // the system keeps some handles of the first time
  EXPECT_EQ(LoadAndUnload(), 0);

  std::vector<std::string> lines = host::ReportLines(path_);
  lines.erase(lines.begin(), std::ranges::find(lines, "Bye!"));
  const std::string port = host::Narrow(port_.name());
  EXPECT_THAT(lines,
              ElementsAre("Bye!",
                          "CAbstractConnection::Cancel [" + port + "]",
                          "CAbstractConnection::Disconnect - disconnected [" + port + "]"));
  EXPECT_TRUE(DeleteFileW(path_.c_str())) << "the report is still open";

  const host::Receiver again(port_);
  EXPECT_NE(again.get(), nullptr);
}

}  // namespace
