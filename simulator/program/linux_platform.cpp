#include <signal.h>

#include <iostream>

#include "simulator/ports/pty.h"
#include "simulator/ports/tcp.h"
#include "simulator/program/platform.h"
#include "simulator/program/port_options.h"

namespace sim {
namespace {

volatile std::sig_atomic_t stop_requested = 0;
// Lets in the signals that end the program, for the waits.
sigset_t wait_mask;

void RequestStop(int) { stop_requested = 1; }

template <typename Port>
void Serve(Port& port, const std::string& name, Receiver& receiver) {
  std::cout << name << std::endl;
  port.Serve(receiver, stop_requested, wait_mask);
}

}  // namespace

void CatchInterrupts() {
  sigset_t ending;
  sigemptyset(&ending);
  struct sigaction action {};
  action.sa_handler = RequestStop;
  for (const int number : {SIGINT, SIGTERM, SIGHUP}) {
    sigaddset(&ending, number);
    sigaction(number, &action, nullptr);
  }
  sigprocmask(SIG_BLOCK, &ending, &wait_mask);
  for (const int number : {SIGINT, SIGTERM, SIGHUP}) {
    sigdelset(&wait_mask, number);
  }
}

void AddPortChoice(CLI::App& command, PortChoice& choice) {
  CLI::Option* const link =
      command.add_option("--link", choice.link, "a symbolic link to the port, removed at the end")
          ->type_name("PATH")
          ->group(kPortGroup);
  command
      .add_option("--tcp", choice.tcp, "a TCP server instead of a pseudo-terminal; port 0 is any")
      ->type_name("[HOST:]PORT")
      ->excludes(link)
      ->group(kPortGroup);
}

void ServePort(const PortChoice& choice, Receiver& receiver) {
  if (!choice.tcp.empty()) {
    TcpPort port(choice.tcp);
    Serve(port, port.address(), receiver);
  } else {
    PtyPort port(choice.link);
    Serve(port, port.slave_name(), receiver);
  }
}

std::vector<std::string> CommandLineWords(int argc, const char* const* argv) {
  return std::vector<std::string>(argv + 1, argv + argc);
}

}  // namespace sim
