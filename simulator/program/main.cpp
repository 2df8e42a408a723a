#include <signal.h>

#include <CLI/CLI.hpp>
#include <array>
#include <cstdio>
#include <exception>
#include <fstream>
#include <functional>
#include <iostream>
#include <memory>
#include <string>
#include <utility>

#include "simulator/files.h"
#include "simulator/line.h"
#include "simulator/ports/pty.h"
#include "simulator/program/port_options.h"
#include "simulator/program/quorin_program.h"
#include "simulator/program/velmar_program.h"
#include "simulator/quorin/receiver.h"
#include "simulator/receiver.h"
#include "simulator/transcript.h"
#include "simulator/velmar/receiver.h"

namespace {

volatile std::sig_atomic_t stop_requested = 0;

void RequestStop(int) { stop_requested = 1; }

// Blocks the signals that end the program; gives the mask that lets them in, for the waits.
sigset_t CatchSignals() {
  sigset_t ending;
  sigemptyset(&ending);
  struct sigaction action {};
  action.sa_handler = RequestStop;
  for (const int number : {SIGINT, SIGTERM, SIGHUP}) {
    sigaddset(&ending, number);
    sigaction(number, &action, nullptr);
  }
  sigset_t before;
  sigprocmask(SIG_BLOCK, &ending, &before);
  for (const int number : {SIGINT, SIGTERM, SIGHUP}) {
    sigdelset(&before, number);
  }
  return before;
}

struct PortOptions {
  sim::FileOptions files;
  std::string link;
};

void AddPortOptions(CLI::App& command, PortOptions& port, sim::LineOptions& line) {
  sim::AddFileOptions(command, port.files);
  command.add_option("--link", port.link, "a symbolic link to the port, removed at the end")
      ->type_name("PATH")
      ->group(sim::kPortGroup);
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

void Run(const MakeReceiver& make_receiver, const PortOptions& port_options) {
  const sigset_t wait_mask = CatchSignals();
  std::ofstream file = sim::OpenTranscript(port_options.files.transcript);
  sim::Transcript transcript = file.is_open() ? sim::Transcript(file) : sim::Transcript();
  const std::unique_ptr<sim::Receiver> receiver = make_receiver(
      sim::FileStore::FromFolder(sim::ToPath(port_options.files.folder)), &transcript);
  sim::PtyPort port(port_options.link);
  std::cout << port.slave_name() << std::endl;
  port.Serve(*receiver, stop_requested, wait_mask);
}

}  // namespace

int main(int argc, char** argv) {
  CLI::App app(
      "Simulated GNSS receivers on a pseudo-terminal. The first line of the output is the "
      "port to open; the program runs until it is interrupted.");
  app.require_subcommand(1);

  PortOptions port;
  MakeReceiver make_receiver;
  for (const Family& family : kFamilies) {
    CLI::App* const command = app.add_subcommand(family.word, family.help);
    command->callback(
        [&make_receiver, make = family.add_options(*command, port)] { make_receiver = make; });
  }

  CLI11_PARSE(app, argc, argv);
  try {
    Run(make_receiver, port);
  } catch (const std::exception& error) {
    std::fprintf(stderr, "rcvlink-sim: %s\n", error.what());
    return sim::kExitFailure;
  }
  return 0;
}
