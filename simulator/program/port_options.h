// What the two programs have in common, whatever the family and the port.
#ifndef SIMULATOR_PROGRAM_PORT_OPTIONS_H_
#define SIMULATOR_PROGRAM_PORT_OPTIONS_H_

#include <CLI/CLI.hpp>
#include <filesystem>
#include <fstream>
#include <string>

#include "simulator/line.h"

namespace sim {

inline constexpr int kExitFailure = 2;
inline constexpr const char* kPortGroup = "Port";

// The path that a command line in UTF-8 names.
std::filesystem::path ToPath(const std::string& text);

// Which files are served, and which one is written.
struct FileOptions {
  std::string folder;
  std::string transcript;
};

void AddFileOptions(CLI::App& command, FileOptions& files);

// Sending in pieces, which every port can do.
void AddPieceOptions(CLI::App& command, LineOptions& line);

// A stream that is not open when there is no path. Throws std::runtime_error, also when there is such
// a file already.
std::ofstream OpenTranscript(const std::string& path);

}  // namespace sim

#endif  // SIMULATOR_PROGRAM_PORT_OPTIONS_H_
