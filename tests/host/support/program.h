// Windows programs that a test runs as a user would, to see their output or to interrupt them.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_PROGRAM_H_
#define RCVLINK_TESTS_HOST_SUPPORT_PROGRAM_H_

#include <chrono>
#include <string>
#include <string_view>
#include <vector>

#include "tests/host/support/bed_connection.h"

namespace bed {

enum class Output {
  kPipe,      // as in a script
  kClosed,    // a pipe whose reader has gone; errors have one of their own
  kTerminal,  // on a console of 100 columns
};

struct ProgramResult {
  int status = 0;
  // On a console, the screen at the end. Lines end in \n.
  std::string output;
  // The standard error; empty on a console, which does not separate it.
  std::string errors;
  // On a console, every text that a line has shown, in order: the steps of a progress bar.
  std::vector<std::string> history;
};

// One running program of the build, given by its file name.
class Program {
 public:
  // `unix_folder` is the folder to run in; empty is the bed's own.
  Program(const std::string& file_name,
          const std::vector<std::string>& arguments,
          Output output = Output::kPipe,
          const std::string& unix_folder = {});

  // Waits until the output contains `text`; raises Error when the program ends without it.
  void Expect(std::string_view text, std::chrono::seconds timeout = std::chrono::seconds(30));
  // Ctrl-C.
  void Interrupt();
  // Waits for the end; raises Error, and ends the program, when it takes too long.
  ProgramResult Finish(std::chrono::seconds timeout = std::chrono::seconds(60));

 private:
  Connection connection_;
  int job_;
};

}  // namespace bed

#endif  // RCVLINK_TESTS_HOST_SUPPORT_PROGRAM_H_
