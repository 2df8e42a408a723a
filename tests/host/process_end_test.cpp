// A host that ends with an open receiver: the system ends its other threads first, and the library
// still closes what it can.
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <windows.h>

#include <algorithm>
#include <string>
#include <vector>

#include "tests/host/support/program.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/report.h"
#include "tests/host/support/simulated_port.h"
#include "tests/support/content.h"

using testing::ElementsAre;

namespace {

class ApiProcessEnd : public testing::Test {
 protected:
  ~ApiProcessEnd() override { DeleteFileW(path_.c_str()); }

  // Runs a host on the port, with a report, and expects that it ends well and says nothing.
  void RunHost(const bed::SimulatedPort& port, std::vector<std::string> arguments = {}) const {
    arguments.insert(arguments.begin(), {host::Narrow(port.name()), host::Narrow(name_)});
    const bed::ProgramResult result = bed::Program("host_end.exe", arguments).Finish();
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.output, "");
    EXPECT_EQ(result.errors, "");
  }
  // The lines of the report from "Bye!" on.
  std::vector<std::string> LastLines() const {
    std::vector<std::string> lines = host::ReportLines(path_);
    lines.erase(lines.begin(), std::ranges::find(lines, "Bye!"));
    return lines;
  }

  const std::wstring name_ = host::NewReportName();
  const std::wstring path_ = host::ReportPath(name_);
};

TEST_F(ApiProcessEnd, ClosesAReceiver) {
  const bed::SimulatedPort port({"quorin"});
  RunHost(port);
  const std::string name = host::Narrow(port.name());
  EXPECT_THAT(LastLines(),
              ElementsAre("Bye!",
                          "CAbstractConnection::Cancel [" + name + "]",
                          "CAbstractConnection::Disconnect - disconnected [" + name + "]"));
  const host::Receiver again(port);
  EXPECT_EQ(again.Identify().result, S_OK);
}

// The download also owns the receiver, and its thread is gone, so that ownership is never released.
TEST_F(ApiProcessEnd, LeavesADownloadAsItIs) {
  bed::SimulatedPort port({"quorin", "--pace"}, {{"A.log", Content(300000)}});
  RunHost(port, {"A.log"});
  EXPECT_THAT(LastLines(), ElementsAre("Bye!"));
}

}  // namespace
