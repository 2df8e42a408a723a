// The command line of a Velmar receiver.
#ifndef SIMULATOR_PROGRAM_VELMAR_PROGRAM_H_
#define SIMULATOR_PROGRAM_VELMAR_PROGRAM_H_

#include <CLI/CLI.hpp>

#include "simulator/velmar/receiver.h"

namespace sim {

// Adds the options of a Velmar receiver to its subcommand; they are stored in `options` when the
// command line is parsed.
void AddVelmarOptions(CLI::App& command, VelmarOptions& options);

}  // namespace sim

#endif  // SIMULATOR_PROGRAM_VELMAR_PROGRAM_H_
