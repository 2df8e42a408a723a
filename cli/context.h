// The input and the outcome of every command.
#ifndef RCVLINK_CLI_CONTEXT_H_
#define RCVLINK_CLI_CONTEXT_H_

#include <nlohmann/json.hpp>
#include <string>

#include "arguments.h"
#include "interrupt.h"
#include "output.h"
#include "results.h"

namespace cli {

using Json = nlohmann::ordered_json;

struct Context {
  const Arguments& arguments;
  const Interrupt& interrupt;
  Output& out;
  Output& err;

  // Standard output: the result, unless it is printed as JSON.
  void PrintResult(const std::string& text) {
    if (!arguments.json) out.Write(text);
  }

  // Standard output: that something was done; not with --quiet.
  void PrintDone(const std::string& text) {
    if (!arguments.quiet) PrintResult(text);
  }

  // Standard error: the current step; not with --quiet or --json.
  void PrintStatus(const std::string& text) {
    if (!arguments.quiet && !arguments.json) err.Write(text);
  }

  // Standard error: what a reader of the result has to know, always.
  void PrintWarning(const std::string& text) { err.Write(text); }

  // Standard error: a failure after which the command goes on; JSON has it in its document.
  void PrintFailure(const Failure& failure) {
    if (!arguments.json) err.Write(Describe(failure));
  }
};

// How progress is to be shown; never `kAuto`.
ProgressMode ProgressModeOf(const Context& context);

// How a command ended. One that could do nothing throws its `Failure` instead.
struct Outcome {
  ExitCode exit = ExitCode::kDone;
  Json document{};  // printed for --json
};

// {"tried", "port", "code", "meaning", "hint", "kept", "exit"}; hint and kept only if there are any
Json ToJson(const Failure& failure);

}  // namespace cli

#endif  // RCVLINK_CLI_CONTEXT_H_
