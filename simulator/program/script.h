// A file with switches of the command line, as JSON.
#ifndef SIMULATOR_PROGRAM_SCRIPT_H_
#define SIMULATOR_PROGRAM_SCRIPT_H_

#include <CLI/CLI.hpp>
#include <string>
#include <string_view>
#include <vector>

namespace sim {

// Adds the switch that names a script.
void AddScriptOption(CLI::App& command);

// The words of a command line for a script: an object whose keys are the long names of switches of
// `command`, without "--". A value is a text, a number, or true for a switch without a value; false
// stands for a switch that is not given, and an array for one that is given several times. Throws
// std::invalid_argument with a message that names the key.
std::vector<std::string> ScriptWords(std::string_view json, const CLI::App& command);

// The words of a command line and, at their end, those of the script that it names. What is on the
// command line replaces what the script has of the same switch. The first word names one of the
// subcommands of `app`. Throws std::invalid_argument with a message that names the file.
std::vector<std::string> WithScript(std::vector<std::string> words, const CLI::App& app);

}  // namespace sim

#endif  // SIMULATOR_PROGRAM_SCRIPT_H_
