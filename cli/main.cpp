// rcvlink-cli: the command line program.
#include <windows.h>

#include <shellapi.h>

#include <algorithm>
#include <exception>
#include <memory>
#include <string>
#include <variant>
#include <vector>

#include "command_line.h"
#include "commands/commands.h"
#include "context.h"
#include "interrupt.h"
#include "output.h"
#include "report_file.h"
#include "results.h"
#include "text.h"

namespace cli {
namespace {

constexpr int kJsonIndent = 2;

struct LocalFreer {
  void operator()(wchar_t** memory) const { LocalFree(memory); }
};

/// The words behind the program's name, in UTF-8.
std::vector<std::string> CommandLineWords() {
  int count = 0;
  const std::unique_ptr<wchar_t*, LocalFreer> words(CommandLineToArgvW(GetCommandLineW(), &count));
  std::vector<std::string> utf8;
  for (int i = 1; i < count; ++i) utf8.push_back(ToUtf8(words.get()[i]));
  return utf8;
}

/// Tells a failure in the way that was asked for.
ExitCode Report(const Failure& failure, bool json, Output& out, Output& err) {
  if (json) {
    out.Write(Json({{"error", ToJson(failure)}}).dump(kJsonIndent) + "\n");
  } else {
    err.Write(Describe(failure));
  }
  return failure.exit;
}

ExitCode RunCommand(const CommandLine& line, Output& out, Output& err) {
  const Arguments& arguments = line.arguments;
  const Interrupt interrupt;
  Context context{arguments, interrupt, out, err};
  const ReportFile report(context);
  try {
    const Outcome outcome = line.command->Run(context);
    if (arguments.json) out.Write(outcome.document.dump(kJsonIndent) + "\n");
    return outcome.exit;
  } catch (Failure& failure) {
    if (failure.port.empty()) failure.port = Printable(arguments.port);
    return Report(failure, arguments.json, out, err);
  }
}

ExitCode Run(Output& out, Output& err) {
  const std::vector<std::string> words = CommandLineWords();
  const bool json = std::find(words.begin(), words.end(), "--json") != words.end();
  try {
    const auto parsed = ParseCommandLine(words, MakeCommands());
    if (const auto* const help = std::get_if<HelpText>(&parsed)) {
      out.Write(help->text);
      return ExitCode::kDone;
    }
    return RunCommand(std::get<CommandLine>(parsed), out, err);
  } catch (const Failure& failure) {
    return Report(failure, json, out, err);
  } catch (const std::exception& error) {
    return Report({.tried = "go on", .code = E_FAIL, .meaning = error.what()}, json, out, err);
  }
}

int Main() {
  Output out(STD_OUTPUT_HANDLE);
  Output err(STD_ERROR_HANDLE);
  const ExitCode exit = Run(out, err);
  if (exit == ExitCode::kDone && out.first_error() != ERROR_SUCCESS) {
    const Failure failure{.exit = ExitCode::kLocalFile,
                          .tried = "write to the standard output",
                          .code = ResultOfWin32(out.first_error())};
    err.Write(Describe(failure));
    return static_cast<int>(failure.exit);
  }
  return static_cast<int>(exit);
}

}  // namespace
}  // namespace cli

int main() { return cli::Main(); }
