#include <CLI/CLI.hpp>
#include <algorithm>
#include <array>
#include <cstdio>
#include <exception>
#include <fstream>
#include <functional>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "simulator/damaged_line.h"
#include "simulator/files.h"
#include "simulator/line.h"
#include "simulator/program/damage_options.h"
#include "simulator/program/platform.h"
#include "simulator/program/port_options.h"
#include "simulator/program/quorin_program.h"
#include "simulator/program/script.h"
#include "simulator/program/velmar_program.h"
#include "simulator/quorin/receiver.h"
#include "simulator/receiver.h"
#include "simulator/transcript.h"
#include "simulator/velmar/receiver.h"

namespace {

struct PortOptions {
  sim::FileOptions files;
  sim::PortChoice choice;
  sim::DamageOptions damage;
};

void AddPortOptions(CLI::App& command, PortOptions& port, sim::LineOptions& line) {
  sim::AddFileOptions(command, port.files);
  sim::AddScriptOption(command);
  sim::AddPortChoice(command, port.choice);
  command.add_option("--speed", line.speed, "the line speed at the start, bit/s")
      ->capture_default_str()
      ->check(CLI::PositiveNumber)
      ->group(sim::kPortGroup);
  command.add_option("--stray-speed", line.stray_speed, "take this speed, whatever is asked for")
      ->check(CLI::PositiveNumber)
      ->group(sim::kPortGroup);
  command
      .add_flag("--garbled", line.garbled, "at a wrong speed, deliver garbage instead of nothing")
      ->group(sim::kPortGroup);
  command.add_flag("--pace", line.paced, "send no faster than the line speed")
      ->group(sim::kPortGroup);
  sim::AddPieceOptions(command, line);
  sim::AddDamageOptions(command, port.damage);
}

using MakeReceiver = std::function<std::unique_ptr<sim::Receiver>(sim::FileStore files,
                                                                  sim::Transcript* transcript)>;

// Adds the switches of a family to its subcommand; gives what makes a receiver of what they say
// once they are parsed.
template <typename FamilyReceiver,
          typename FamilyOptions,
          void (*AddFamilyOptions)(CLI::App&, FamilyOptions&)>
MakeReceiver AddOptions(CLI::App& command, PortOptions& port) {
  const auto options = std::make_shared<FamilyOptions>();
  AddPortOptions(command, port, options->line);
  AddFamilyOptions(command, *options);
  return [options](sim::FileStore files, sim::Transcript* transcript) {
    return std::make_unique<FamilyReceiver>(*options, std::move(files), transcript);
  };
}

struct Family {
  const char* word;
  const char* help;
  MakeReceiver (*add_options)(CLI::App& command, PortOptions& port);
};

// A new family is one more line.
constexpr std::array kFamilies = {
    Family{"quorin",
           "a Quorin receiver",
           AddOptions<sim::QuorinReceiver, sim::QuorinOptions, sim::AddQuorinOptions>},
    Family{"velmar",
           "a Velmar receiver",
           AddOptions<sim::VelmarReceiver, sim::VelmarOptions, sim::AddVelmarOptions>}};

void Run(const MakeReceiver& make_receiver, const PortOptions& options) {
  sim::CatchInterrupts();
  std::ofstream file = sim::OpenTranscript(options.files.transcript);
  sim::Transcript transcript = file.is_open() ? sim::Transcript(file) : sim::Transcript();
  const std::unique_ptr<sim::Receiver> receiver =
      make_receiver(sim::FileStore::FromFolder(sim::ToPath(options.files.folder)), &transcript);
  sim::DamagedLine line(options.damage, *receiver, &transcript);
  sim::ServePort(options.choice, line);
}

int Fail(const std::exception& error) {
  std::fprintf(stderr, "rcvlink-sim: %s\n", error.what());
  return sim::kExitFailure;
}

}  // namespace

int main(int argc, char** argv) {
  CLI::App app(
      "Simulated GNSS receivers. The first line of the output is the port to open; the program "
      "runs until it is interrupted.",
      "rcvlink-sim");
  app.require_subcommand(1);
  app.set_version_flag("--version", "rcvlink-sim " RCVLINK_VERSION);

  PortOptions port;
  MakeReceiver make_receiver;
  for (const Family& family : kFamilies) {
    CLI::App* const command = app.add_subcommand(family.word, family.help);
    command->callback(
        [&make_receiver, make = family.add_options(*command, port)] { make_receiver = make; });
  }

  try {
    std::vector<std::string> words = sim::WithScript(sim::CommandLineWords(argc, argv), app);
    // CLI11 takes them from the end.
    std::reverse(words.begin(), words.end());
    app.parse(words);
  } catch (const CLI::ParseError& error) {
    return app.exit(error);
  } catch (const std::exception& error) {
    return Fail(error);
  }
  try {
    Run(make_receiver, port);
  } catch (const std::exception& error) {
    return Fail(error);
  }
  return 0;
}
