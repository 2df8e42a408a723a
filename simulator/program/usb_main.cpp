#include <windows.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <array>
#include <cstdio>
#include <exception>
#include <fstream>
#include <iostream>
#include <string>
#include <thread>
#include <vector>

#include "simulator/files.h"
#include "simulator/ports/usb.h"
#include "simulator/program/interrupt.h"
#include "simulator/program/platform.h"
#include "simulator/program/port_options.h"
#include "simulator/program/quorin_program.h"
#include "simulator/program/usb_options.h"
#include "simulator/quorin/receiver.h"
#include "simulator/transcript.h"
#include "simulator/usb/device.h"

namespace {

constexpr const char* kUsbPortName = "/dev/usb";

// The parent ends the program by closing its input. That also happens when the parent dies.
void StopAtEndOfInput() {
  const HANDLE input = GetStdHandle(STD_INPUT_HANDLE);
  std::array<char, 256> ignored;
  DWORD count = 0;
  while (ReadFile(input, ignored.data(), static_cast<DWORD>(ignored.size()), &count, nullptr) &&
         count > 0) {
  }
  SetEvent(sim::StopEvent());
}

struct PortOptions {
  sim::FileOptions files;
  std::string device;
};

void Run(const sim::QuorinOptions& options,
         const sim::UsbOptions& usb_options,
         const PortOptions& port_options) {
  std::ofstream file = sim::OpenTranscript(port_options.files.transcript);
  sim::Transcript transcript = file.is_open() ? sim::Transcript(file) : sim::Transcript();
  sim::QuorinReceiver receiver(
      options, sim::FileStore::FromFolder(sim::ToPath(port_options.files.folder)), &transcript);
  sim::UsbDevice device(usb_options, receiver, transcript);
  sim::UsbPort port(std::wstring(port_options.device.begin(), port_options.device.end()));
  std::cout << "\\\\?\\" << port_options.device << std::endl;
  sim::CatchInterrupts();
  std::thread(StopAtEndOfInput).detach();
  port.Serve(device, receiver, sim::StopEvent());
}

}  // namespace

int main(int argc, char** argv) {
  CLI::App app(
      "Simulated GNSS receivers on a simulated USB device. The first line of the output is the "
      "path to open; the program runs until its standard input ends or it is interrupted.",
      "rcvlink-sim-usb");
  app.require_subcommand(1);
  app.set_version_flag("--version", "rcvlink-sim-usb " RCVLINK_VERSION);

  PortOptions port;
  sim::UsbOptions usb;
  sim::QuorinOptions quorin;
  quorin.identity.port_name = kUsbPortName;
  CLI::App* const command = app.add_subcommand("quorin", "a Quorin receiver");
  sim::AddFileOptions(*command, port.files);
  command->add_option("--device", port.device, "the name of the device, opened as \\\\?\\NAME")
      ->required()
      ->type_name("NAME")
      ->group(sim::kPortGroup);
  sim::AddPieceOptions(*command, quorin.line);
  sim::AddUsbOptions(*command, usb);
  sim::AddQuorinOptions(*command, quorin);

  try {
    std::vector<std::string> words = sim::CommandLineWords(argc, argv);
    // CLI11 takes them from the end.
    std::reverse(words.begin(), words.end());
    app.parse(words);
  } catch (const CLI::ParseError& error) {
    return app.exit(error);
  }
  try {
    Run(quorin, usb, port);
  } catch (const std::exception& error) {
    std::fprintf(stderr, "rcvlink-sim-usb: %s\n", error.what());
    return sim::kExitFailure;
  }
  return 0;
}
