// Options whose text is a small language of its own, such as "3@always".
#ifndef SIMULATOR_PROGRAM_TEXT_OPTION_H_
#define SIMULATOR_PROGRAM_TEXT_OPTION_H_

#include <CLI/CLI.hpp>
#include <functional>
#include <string>

namespace sim {

// Adds an option that may be given several times. `take` gets each text, and throws
// std::invalid_argument when the text does not fit.
CLI::Option* AddTextOption(CLI::App& command,
                           const std::string& name,
                           const std::string& form,
                           const std::string& help,
                           std::function<void(const std::string&)> take);

}  // namespace sim

#endif  // SIMULATOR_PROGRAM_TEXT_OPTION_H_
