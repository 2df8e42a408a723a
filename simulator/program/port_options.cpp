#include "simulator/program/port_options.h"

#include <stdexcept>

namespace sim {
namespace {

std::string RefuseMissingFolder(const std::string& text) {
  return std::filesystem::is_directory(ToPath(text)) ? "" : "there is no folder " + text;
}

}  // namespace

std::filesystem::path ToPath(const std::string& text) {
  return std::filesystem::path(std::u8string(text.begin(), text.end()));
}

void AddFileOptions(CLI::App& command, FileOptions& files) {
  command.add_option("--folder", files.folder, "the files to serve")
      ->required()
      ->check(RefuseMissingFolder)
      ->type_name("DIR");
  command.add_option("--transcript", files.transcript, "record the session")->type_name("FILE");
}

void AddPieceOptions(CLI::App& command, LineOptions& line) {
  command.add_option("--pieces", line.piece_size, "send in pieces of this many bytes")
      ->type_name("BYTES")
      ->check(CLI::PositiveNumber)
      ->group(kPortGroup);
  command.add_option("--piece-gap", line.piece_gap_ms, "the pause between pieces, ms")
      ->capture_default_str()
      ->type_name("MS")
      ->group(kPortGroup);
}

std::ofstream OpenTranscript(const std::string& path) {
  std::ofstream file;
  if (!path.empty()) {
    // Files only: a device or a pipe is there before it is written to.
    if (std::filesystem::is_regular_file(ToPath(path))) {
      throw std::runtime_error("the transcript " + path + " exists already");
    }
    file.open(ToPath(path), std::ios::binary | std::ios::trunc);
    if (!file) {
      throw std::runtime_error("cannot write the transcript " + path);
    }
  }
  return file;
}

}  // namespace sim
