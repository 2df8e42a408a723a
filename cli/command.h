// The interface of all subcommands.
#ifndef RCVLINK_CLI_COMMAND_H_
#define RCVLINK_CLI_COMMAND_H_

#include <memory>
#include <vector>

#include "arguments.h"
#include "context.h"

namespace CLI {
class App;
}

namespace cli {

// A subcommand: its word and help, its own options, and what it does. Each has a file of its own in
// commands/ and is known to the table in commands/commands.cpp only.
class Command {
 public:
  struct Text {
    const char* word;      // "ls"
    const char* summary;   // one line, for the list of commands
    const char* examples;  // the end of the command's --help
  };

  explicit Command(Text text) : text_(text) {}
  virtual ~Command() = default;
  Command(const Command&) = delete;
  Command& operator=(const Command&) = delete;

  const Text& text() const { return text_; }

  // Adds what may follow the word on the command line, besides the options of all commands.
  // `arguments`: what `AddPort` fills; outlives `app`.
  virtual void AddOptions(CLI::App& app, Arguments& arguments) = 0;

  // Checks the arguments before anything is done.
  // Throws Failure with ExitCode::kUsage when they are invalid.
  virtual void Check() const {}

  // Throws Failure when it could do nothing.
  virtual Outcome Run(Context& context) = 0;

 private:
  Text text_;
};

using Commands = std::vector<std::unique_ptr<Command>>;

}  // namespace cli

#endif  // RCVLINK_CLI_COMMAND_H_
