// The command line of a damaged line.
#ifndef SIMULATOR_PROGRAM_DAMAGE_OPTIONS_H_
#define SIMULATOR_PROGRAM_DAMAGE_OPTIONS_H_

#include <CLI/CLI.hpp>

#include "simulator/damaged_line.h"

namespace sim {

// Adds the options of the line to a family's subcommand; they are stored in `damage` when the command
// line is parsed.
void AddDamageOptions(CLI::App& command, DamageOptions& damage);

}  // namespace sim

#endif  // SIMULATOR_PROGRAM_DAMAGE_OPTIONS_H_
