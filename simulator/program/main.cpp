#include <signal.h>

#include <CLI/CLI.hpp>
#include <cstdio>
#include <exception>
#include <fstream>
#include <iostream>
#include <string>

#include "simulator/files.h"
#include "simulator/line.h"
#include "simulator/ports/pty.h"
#include "simulator/program/port_options.h"
#include "simulator/program/quorin_program.h"
#include "simulator/program/velmar_program.h"
#include "simulator/quorin/receiver.h"
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

template <typename FamilyReceiver, typename FamilyOptions>
void Run(const FamilyOptions& options, const PortOptions& port_options) {
  const sigset_t wait_mask = CatchSignals();
  std::ofstream file = sim::OpenTranscript(port_options.files.transcript);
  sim::Transcript transcript = file.is_open() ? sim::Transcript(file) : sim::Transcript();
  FamilyReceiver receiver(
      options, sim::FileStore::FromFolder(sim::ToPath(port_options.files.folder)), &transcript);
  sim::PtyPort port(port_options.link);
  std::cout << port.slave_name() << std::endl;
  port.Serve(receiver, stop_requested, wait_mask);
}

}  // namespace

int main(int argc, char** argv) {
  CLI::App app(
      "Simulated GNSS receivers on a pseudo-terminal. The first line of the output is the "
      "port to open; the program runs until it is interrupted.");
  app.require_subcommand(1);

  PortOptions port;
  sim::QuorinOptions quorin;
  CLI::App* const quorin_command = app.add_subcommand("quorin", "a Quorin receiver");
  AddPortOptions(*quorin_command, port, quorin.line);
  sim::AddQuorinOptions(*quorin_command, quorin);

  sim::VelmarOptions velmar;
  CLI::App* const velmar_command = app.add_subcommand("velmar", "a Velmar receiver");
  AddPortOptions(*velmar_command, port, velmar.line);
  sim::AddVelmarOptions(*velmar_command, velmar);

  CLI11_PARSE(app, argc, argv);
  try {
    if (quorin_command->parsed()) {
      Run<sim::QuorinReceiver>(quorin, port);
    } else {
      Run<sim::VelmarReceiver>(velmar, port);
    }
  } catch (const std::exception& error) {
    std::fprintf(stderr, "rcvlink-sim: %s\n", error.what());
    return sim::kExitFailure;
  }
  return 0;
}
