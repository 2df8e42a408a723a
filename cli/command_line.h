// Parses the command line into a command and its arguments.
#ifndef RCVLINK_CLI_COMMAND_LINE_H_
#define RCVLINK_CLI_COMMAND_LINE_H_

#include <memory>
#include <string>
#include <variant>
#include <vector>

#include "arguments.h"
#include "command.h"

namespace cli {

// A parsed command line. All that can be checked without a receiver is checked.
struct CommandLine {
  Arguments arguments;
  std::unique_ptr<Command> command;
};

// Text to print instead of doing anything: --help or --version.
struct HelpText {
  std::string text;
};

// Reads the command line.
// `args`: UTF-8, without the program's name
// `commands`: all commands of the program
// Throws Failure with ExitCode::kUsage when the line is invalid.
std::variant<CommandLine, HelpText> ParseCommandLine(const std::vector<std::string>& args,
                                                     Commands commands);

// A command and its options, for completion.
struct CommandWords {
  struct Word {
    std::string word;
    std::string description;
  };

  Word command;               // empty for the options of all commands
  std::vector<Word> options;  // "--json"
};

// The options of all commands, and then each command.
std::vector<CommandWords> WordsOf(const Commands& commands);

}  // namespace cli

#endif  // RCVLINK_CLI_COMMAND_LINE_H_
