// A Velmar driver on a scripted connection whose receiver answers by command.
#ifndef RCVLINK_TESTS_VELMAR_VELMAR_DRIVER_H_
#define RCVLINK_TESTS_VELMAR_VELMAR_DRIVER_H_

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <functional>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "tests/support/driver_lock.h"
#include "tests/support/manual_clock.h"
#include "tests/support/report_capture.h"
#include "tests/support/scripted_connection.h"
#include "tests/velmar/velmar_replies.h"
#include "velmar/velmar_protocol.h"

class VelmarDriver : public testing::Test, public CIProtocolCallback {
 protected:
  VelmarDriver() : VelmarDriver(std::make_unique<ScriptedConnection>()) {}
  explicit VelmarDriver(std::unique_ptr<ScriptedConnection> owned)
      : connection(owned.get()), driver(std::move(owned)) {
    driver.SetCallback(this);
    connection->on_flush = [this] {
      connection->DropAnswers();
      return S_OK;
    };
    connection->on_write = [this](std::string_view bytes) {
      const std::string command(bytes);
      if (before_command) before_command(command);
      const auto answer = answers.find(command);
      if (answer != answers.end() && !answer->second.empty()) connection->GiveRead(answer->second);
      return S_OK;
    };
  }

  void OnProgress(BYTE percent) override {
    percents.push_back(percent);
    if (on_percent) on_percent(percent);
  }

  ManualClock clock;
  ReportCapture report;
  ScriptedConnection* connection;  // the driver's
  WithLockText<CVelmarProtocol> driver;
  std::map<std::string, std::string> answers;  // by command; other commands are not answered
  std::function<void(const std::string& command)> before_command;
  std::vector<int> percents;
  std::function<void(int percent)> on_percent;  // may be empty
};

#endif  // RCVLINK_TESTS_VELMAR_VELMAR_DRIVER_H_
