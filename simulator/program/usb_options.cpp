#include "simulator/program/usb_options.h"

#include <cstdint>
#include <string>

#include "simulator/program/text_option.h"
#include "simulator/usb/faults.h"

namespace sim {
namespace {

constexpr const char* kDeviceGroup = "USB device";
constexpr const char* kFaultGroup = "USB faults (always by default, write errors once)";
constexpr const char* kEndpointForm = "ADDRESS[@TIMES]";

void AddDeviceOptions(CLI::App& command, UsbOptions& options) {
  DescriptorOptions& descriptor = options.descriptor;
  AddTextOption(
      command,
      "--endpoints",
      "ADDRESS[:TYPE],...",
      "other endpoints than 0x81,0x02; bulk by default",
      [&descriptor](const std::string& text) { descriptor.endpoints = ParseEndpoints(text); })
      ->group(kDeviceGroup);
  command
      .add_flag(
          "--one-endpoint",
          [&descriptor](int64_t) { descriptor.endpoints = {{kDefaultInEndpoint}}; },
          "only the endpoint 0x81")
      ->group(kDeviceGroup);
  command
      .add_flag("--class-descriptor",
                descriptor.class_descriptor,
                "class-specific descriptors between the interface and its endpoints")
      ->group(kDeviceGroup);
  command
      .add_option("--endpoint-length",
                  descriptor.endpoint_length,
                  "the length of endpoint descriptors; longer ones are filled up with zeros")
      ->type_name("BYTES")
      ->group(kDeviceGroup);
  command
      .add_option("--total-length",
                  descriptor.total_length,
                  "the total length in the descriptor, instead of the true one")
      ->type_name("BYTES")
      ->group(kDeviceGroup);
  command
      .add_option("--transfer", options.transfer_length, "the most bytes in one transfer to a host")
      ->capture_default_str()
      ->check(CLI::PositiveNumber)
      ->type_name("BYTES")
      ->group(kDeviceGroup);
  command.add_flag("--configured", options.configured, "configured from the start")
      ->group(kDeviceGroup);
}

void AddFaults(CLI::App& command, UsbFaults& faults) {
  command
      .add_option("--short-descriptor",
                  faults.short_descriptor,
                  "give only so many bytes of the descriptor")
      ->type_name("BYTES")
      ->group(kFaultGroup);
  AddTextOption(command,
                "--refuse-descriptor",
                "header|whole[@TIMES]",
                "refuse the request for its header, or for all of it",
                [&faults](const std::string& text) {
                  faults.descriptors.push_back(ParseDescriptorRefusal(text));
                })
      ->group(kFaultGroup);
  AddTextOption(
      command,
      "--refuse-bind",
      kEndpointForm,
      "refuse to bind the endpoint",
      [&faults](const std::string& text) { faults.binds.push_back(ParseEndpointRefusal(text)); })
      ->group(kFaultGroup);
  AddTextOption(
      command,
      "--refuse-reset",
      kEndpointForm,
      "refuse to reset the endpoint",
      [&faults](const std::string& text) { faults.resets.push_back(ParseEndpointRefusal(text)); })
      ->group(kFaultGroup);
  AddTextOption(
      command,
      "--write-error",
      "NUMBER[:WRITES][@TIMES]",
      "writes fail with the error, such as 0xE0000001, after so many good ones",
      [&faults](const std::string& text) { faults.writes.push_back(ParseWriteError(text)); })
      ->group(kFaultGroup);
}

}  // namespace

void AddUsbOptions(CLI::App& command, UsbOptions& options) {
  AddDeviceOptions(command, options);
  AddFaults(command, options.faults);
}

}  // namespace sim
