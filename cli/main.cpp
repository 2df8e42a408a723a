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

// The words after the program's name, in UTF-8.
std::vector<std::string> CommandLineWords() {
  int count = 0;
  const std::unique_ptr<wchar_t*, LocalFreer> words(CommandLineToArgvW(GetCommandLineW(), &count));
  std::vector<std::string> utf8;
  for (int i = 1; i < count; ++i) utf8.push_back(ToUtf8(words.get()[i]));
  return utf8;
}

// Prints a document, with the path of the report if there is one.
void PrintJson(Json document, const std::wstring& report, Output& out) {
  if (!report.empty()) document["report"] = ToUtf8(report);
  out.Write(document.dump(kJsonIndent) + "\n");
}

// Prints a failure as text or as JSON.
ExitCode Tell(
    const Failure& failure, bool json, const std::wstring& report, Output& out, Output& err) {
  if (json) {
    PrintJson({{"error", ToJson(failure)}}, report, out);
  } else {
    err.Write(Describe(failure));
  }
  return failure.exit;
}

ExitCode RunCommand(const CommandLine& line, Output& out, Output& err) {
  const Arguments& arguments = line.arguments;
  const bool silent = arguments.quiet || arguments.json;
  const Interrupt interrupt(silent ? "" : "\nStopping, this may take a moment ...\n");
  Context context{arguments, interrupt, out, err};
  std::wstring report_path;
  try {
    const ReportFile report(context);
    report_path = report.path();
    Outcome outcome = line.command->Run(context);
    if (arguments.json) PrintJson(std::move(outcome.document), report_path, out);
    return outcome.exit;
  } catch (Failure& failure) {
    if (failure.port.empty()) failure.port = Printable(arguments.port);
    return Tell(failure, arguments.json, report_path, out, err);
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
    return Tell(failure, json, L"", out, err);
  } catch (const std::exception& error) {
    return Tell(
        {.tried = "continue", .code = E_FAIL, .meaning = error.what()}, json, L"", out, err);
  }
}

int Main() {
  Output out(STD_OUTPUT_HANDLE);
  Output err(STD_ERROR_HANDLE);
  const ExitCode exit = Run(out, err);
  if (exit == ExitCode::kDone && out.first_error() != ERROR_SUCCESS && !out.IsClosed()) {
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
