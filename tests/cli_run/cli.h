// rcvlink-cli.exe, run as a user runs it, with a simulated receiver on a port.
#ifndef RCVLINK_TESTS_CLI_RUN_CLI_H_
#define RCVLINK_TESTS_CLI_RUN_CLI_H_

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <map>
#include <memory>
#include <string>
#include <vector>

#include "tests/host/support/program.h"
#include "tests/host/support/simulated_port.h"
#include "tests/host/support/temp_folder.h"
#include "tests/support/content.h"

namespace cli_run {

// The exit codes that the program documents.
enum ExitCode {
  kDone = 0,
  kFailed = 1,
  kUsage = 2,
  kNoReceiver = 3,
  kCancelled = 4,
  kLocalFile = 5
};

constexpr char kProgram[] = "rcvlink-cli.exe";

class Cli : public testing::Test {
 protected:
  using Files = std::map<std::string, std::string>;

  // Runs the program in `folder` without a receiver of its own.
  bed::ProgramResult Run(const std::vector<std::string>& arguments) const {
    return bed::Program(kProgram, arguments, bed::Output::kPipe, folder.unix_path()).Finish();
  }
  // Runs a command on a receiver's port, at its speed: {"ls"} becomes ls COM12 --speed 9600.
  bed::ProgramResult RunOn(const bed::SimulatedPort& receiver,
                           std::vector<std::string> arguments) const {
    return Run(On(receiver, std::move(arguments)));
  }
  static std::string Port(const bed::SimulatedPort& receiver) {
    const std::wstring name = receiver.name();
    return {name.begin(), name.end()};
  }
  static std::vector<std::string> On(const bed::SimulatedPort& receiver,
                                     std::vector<std::string> arguments) {
    arguments.insert(arguments.begin() + 1, Port(receiver));
    arguments.insert(arguments.end(), {"--speed", "9600"});
    return arguments;
  }

  // A Velmar receiver that lists more than the disk of `folder` has room for; null where a list
  // cannot be so long.
  std::unique_ptr<bed::SimulatedPort> ReceiverOfMoreThanTheDisk() const;

  bool Has(const std::string& name) const { return std::filesystem::exists(folder / name); }
  std::vector<std::string> LocalFiles() const;

  bed::TempFolder folder;  // where the program runs
};

}  // namespace cli_run

#endif  // RCVLINK_TESTS_CLI_RUN_CLI_H_
