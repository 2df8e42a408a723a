// What is different on Linux and on Windows: the ports, the words of the command line, the end.
#ifndef SIMULATOR_PROGRAM_PLATFORM_H_
#define SIMULATOR_PROGRAM_PLATFORM_H_

#include <CLI/CLI.hpp>
#include <string>
#include <vector>

#include "simulator/receiver.h"

namespace sim {

// Where the receiver is reached. A system has some of these only.
struct PortChoice {
  std::string link;
  std::string tcp;
  std::string com;
  std::string pipe;
};

void AddPortChoice(CLI::App& command, PortChoice& choice);

// Prints the name of the port and serves it until the program is interrupted or the receiver is
// gone. Throws std::exception.
void ServePort(const PortChoice& choice, Receiver& receiver);

// From here on an interrupt ends ServePort, and not the program.
void CatchInterrupts();

// The words after the program's name, in UTF-8.
std::vector<std::string> CommandLineWords(int argc, const char* const* argv);

}  // namespace sim

#endif  // SIMULATOR_PROGRAM_PLATFORM_H_
