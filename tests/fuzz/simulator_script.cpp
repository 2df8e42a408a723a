// A file of the simulator's --script: JSON that becomes switches of a command.
#include <cstdlib>

#include "simulator/program/script.h"
#include "tests/fuzz/target.h"

void fuzz::Target(std::span<const uint8_t> bytes) {
  CLI::App command;
  bool flag = false;
  int number = 0;
  std::vector<std::string> texts;
  command.add_flag("--deaf", flag);
  command.add_option("--delay", number);
  command.add_option("--lose-block", texts);
  sim::AddScriptOption(command);
  const std::string json = Input(bytes).Rest();
  try {
    for (const std::string& word : sim::ScriptWords(json, command)) {
      // Nothing in the file may become a positional argument, or a switch that has no value there.
      if (!word.starts_with("--") || word.starts_with("--script") || word.starts_with("--help")) {
        std::abort();
      }
    }
  } catch (const std::invalid_argument&) {
  }
}
