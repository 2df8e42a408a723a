// The command line of a Quorin receiver.
#ifndef SIMULATOR_PROGRAM_QUORIN_PROGRAM_H_
#define SIMULATOR_PROGRAM_QUORIN_PROGRAM_H_

#include <CLI/CLI.hpp>

#include "simulator/quorin/receiver.h"

namespace sim {

// Adds the options of a Quorin receiver to its subcommand; they are stored in `options` when the
// command line is parsed.
void AddQuorinOptions(CLI::App& command, QuorinOptions& options);

}  // namespace sim

#endif  // SIMULATOR_PROGRAM_QUORIN_PROGRAM_H_
