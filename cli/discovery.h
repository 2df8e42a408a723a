// Finds the receiver that the command line names.
#ifndef RCVLINK_CLI_DISCOVERY_H_
#define RCVLINK_CLI_DISCOVERY_H_

#include <windows.h>

#include <optional>
#include <string>

#include "context.h"
#include "port_memory.h"
#include "rcvlink.h"
#include "search_display.h"
#include "sweep.h"

namespace cli {

struct FoundReceiver {
  void* handle;  // of the library; closed with `devapi::CloseReceiver`
  EInstanceType link;
  std::optional<KnownSetting> setting{};  // of a serial port
};

// Where to look for a receiver.
struct SearchPlace {
  std::wstring port;
  EInstanceType link;
};

// Searches the port of the command line, or tries one setting when speed or RTS is given.
// Throws Failure when there is no receiver.
FoundReceiver FindReceiver(Context& context);

// The same for another place than that of the command line. May run on any thread.
FoundReceiver FindReceiverAt(const Context& context,
                             const SearchPlace& place,
                             SearchDisplay& display);

// One try on a serial port.
// Returns as `devapi::CreateReceiverOnSerial`.
long TryPort(const Context& context, EProtocol family, DCB settings, void** receiver);

// The settings that a serial port has: those with which it was used last. Nothing when it cannot be
// opened.
std::optional<DCB> CurrentSettings(const std::wstring& port);

// What is remembered of ports; nothing with --no-memory.
PortMemory MemoryOf(const Arguments& arguments);

// What --verbose prints when the setting of a port could not be saved.
std::string UnwrittenMemory(const std::wstring& port);

}  // namespace cli

#endif  // RCVLINK_CLI_DISCOVERY_H_
