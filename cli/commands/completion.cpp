#include <string>
#include <string_view>

#include "command.h"
#include "command_line.h"
#include "commands.h"

namespace cli {
namespace {

constexpr std::string_view kStart =
    R"(Register-ArgumentCompleter -Native -CommandName 'rcvlink-cli', 'rcvlink-cli.exe' -ScriptBlock {
    param($wordToComplete, $commandAst, $cursorPosition)
)";

// COM ports are offered only after a command. All other words are left to the completion of file
// names.
constexpr std::string_view kEnd =
    R"(    $typed = @($commandAst.CommandElements | Select-Object -Skip 1 | ForEach-Object { "$_" })
    $command = $typed | Where-Object { $commands.Contains($_) } | Select-Object -First 1
    if ($wordToComplete -like '-*') {
        $words = [ordered]@{}
        if ($command) { $options[$command].GetEnumerator() | ForEach-Object { $words[$_.Key] = $_.Value } }
        $options[''].GetEnumerator() | ForEach-Object { $words[$_.Key] = $_.Value }
    } elseif (-not $command -or $command -eq $wordToComplete) {
        $words = $commands
    } else {
        $words = [ordered]@{}
        [System.IO.Ports.SerialPort]::GetPortNames() | ForEach-Object { $words[$_] = 'COM port' }
    }
    $words.GetEnumerator() | Where-Object { $_.Key -like "$wordToComplete*" } | ForEach-Object {
        [System.Management.Automation.CompletionResult]::new($_.Key, $_.Key, 'ParameterValue', $_.Value)
    }
}
)";

// A literal string of PowerShell.
std::string Quoted(const std::string& text) {
  std::string quoted = "'";
  for (const char character : text) quoted.append(character == '\'' ? 2 : 1, character);
  return quoted + "'";
}

std::string Entry(const CommandWords::Word& word) {
  return Quoted(word.word) + " = " + Quoted(word.description) + "\n";
}

std::string Script() {
  std::string commands = "    $commands = [ordered]@{\n";
  std::string options = "    $options = @{\n";
  for (const CommandWords& words : WordsOf(MakeCommands())) {
    if (!words.command.word.empty()) commands += "        " + Entry(words.command);
    options += "        " + Quoted(words.command.word) + " = [ordered]@{\n";
    for (const auto& option : words.options) options += "            " + Entry(option);
    options += "        }\n";
  }
  return std::string(kStart) + commands + "    }\n" + options + "    }\n" + std::string(kEnd);
}

class Completion : public Command {
 public:
  using Command::Command;

  void AddOptions(CLI::App& /*app*/, Arguments& /*arguments*/) override {}

  Outcome Run(Context& context) override {
    const std::string script = Script();
    context.PrintResult(script);
    return {.document = {{"script", script}}};
  }
};

}  // namespace

std::unique_ptr<Command> MakeCompletion() {
  return std::make_unique<Completion>(
      Command::Text{"completion",
                    "Print a script that completes commands in PowerShell",
                    "Example, a line for the file named by $PROFILE:\n"
                    "  rcvlink-cli completion | Out-String | Invoke-Expression"});
}

}  // namespace cli
