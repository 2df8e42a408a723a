// The arguments that all commands share.
#ifndef RCVLINK_CLI_ARGUMENTS_H_
#define RCVLINK_CLI_ARGUMENTS_H_

#include <optional>
#include <string>

#include "rcvlink.h"
#include "settings.h"

namespace cli {

// How progress is shown on standard error. Automatic: a bar on a terminal, lines elsewhere, nothing
// with --quiet or --json.
enum class ProgressMode { kAuto, kBar, kLines, kJson, kNone };

struct Arguments {
  std::wstring port;                     // empty for commands without one
  EInstanceType link = eInstanceSerial;  // any: serial, then USB, under the same name
  EProtocol protocol = eProtocolAny;
  std::optional<unsigned long> speed;  // given: one try at this speed
  std::optional<RtsMode> rts;          // given: one try with this use of RTS
  bool no_memory = false;              // neither use nor save the setting found last time
  bool json = false;
  ProgressMode progress = ProgressMode::kAuto;
  bool quiet = false;
  bool verbose = false;
  bool force = false;            // files of this computer may be overwritten
  std::wstring report;           // name of the library's report file; empty: none
  unsigned stall_timeout_s = 0;  // 0: never
};

}  // namespace cli

#endif  // RCVLINK_CLI_ARGUMENTS_H_
