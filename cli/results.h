// Failures: their messages and exit codes.
#ifndef RCVLINK_CLI_RESULTS_H_
#define RCVLINK_CLI_RESULTS_H_

#include <string>

namespace cli {

// What the program returns to its caller.
enum class ExitCode : int {
  kDone = 0,
  kFailed = 1,
  kUsage = 2,
  kNoReceiver = 3,
  kCancelled = 4,
  kLocalFile = 5,
};

// The exit codes and their meaning, for --help.
std::string ExitCodeTable();

// What a result code of the library, or of Windows, means.
std::string MeaningOf(long code);

// A Win32 error as a result code.
long ResultOfWin32(unsigned long error);

// Why the program could not do what it was asked to; thrown, and reported in one place.
struct Failure {
  ExitCode exit = ExitCode::kFailed;
  std::string tried{};    // "download A.DAT": what the program could not do
  std::string port{};     // may be left empty: the port of the command line is then named
  long code = 0;          // the result code
  std::string meaning{};  // empty: `MeaningOf` says it
  std::string hint{};     // what the user can do about it; may be empty
  std::string kept{};     // path of the data that a failed download kept; may be empty
};

// The meaning of a failure: its own, or that of its code.
std::string MeaningOf(const Failure& failure);

// What the user can try: the failure's own hint, or the command that explains its code.
std::string HintOf(const Failure& failure);

// The failure as lines for a person, each with its line end.
std::string Describe(const Failure& failure);

}  // namespace cli

#endif  // RCVLINK_CLI_RESULTS_H_
