#include <iostream>

#include "simulator/ports/com.h"
#include "simulator/ports/pipe.h"
#include "simulator/program/interrupt.h"
#include "simulator/program/platform.h"
#include "simulator/program/port_options.h"

namespace sim {
namespace {

constexpr const char* kPipeFolder = "\\\\.\\pipe\\";

template <typename Port>
void Serve(Port& port, const std::string& name, Receiver& receiver) {
  std::cout << name << std::endl;
  port.Serve(receiver, StopEvent());
}

}  // namespace

void AddPortChoice(CLI::App& command, PortChoice& choice) {
  CLI::Option_group& ports =
      *command.add_option_group(kPortGroup, "where the receiver is, one of these");
  ports.add_option("--port", choice.com, "a serial port, one end of a pair or of a null modem")
      ->type_name("COM8");
  ports.add_option("--pipe", choice.pipe, "a named pipe, which hosts open as \\\\.\\pipe\\NAME")
      ->type_name("NAME");
  ports.require_option(1);
}

void ServePort(const PortChoice& choice, Receiver& receiver) {
  if (!choice.pipe.empty()) {
    const std::string path = kPipeFolder + choice.pipe;
    PipePort port(ToPath(path).wstring());
    Serve(port, path, receiver);
  } else {
    ComPort port(ToPath(choice.com).wstring());
    Serve(port, choice.com, receiver);
  }
}

}  // namespace sim
