/// @file arguments.h
/// The command line.
#ifndef RCVLINK_CLI_ARGUMENTS_H_
#define RCVLINK_CLI_ARGUMENTS_H_

#include <optional>
#include <string>
#include <variant>
#include <vector>

#include "rcvlink.h"
#include "settings.h"

namespace cli {

enum class Command { kPorts, kFind, kInfo, kList, kGet, kRemove, kMove, kSet, kCheck };

/// What the user asked for, checked as far as that goes without a receiver.
struct Arguments {
  Command command = Command::kPorts;
  std::wstring port;
  std::vector<std::wstring> names;  ///< files of the receiver; for kMove the old and the new name
  std::wstring output;              ///< kGet: a folder or a file; may be empty
  bool all = false;                 ///< kGet: every file of the receiver
  bool force = false;               ///< kGet: overwrite
  SettingChange change;             ///< kSet
  EInstanceType link = eInstanceSerial;  ///< any: serial, then USB, under the same name
  EProtocol protocol = eProtocolAny;
  std::optional<unsigned long> speed;  ///< given: one try at this speed
  std::optional<RtsMode> rts;          ///< given: one try with this use of RTS
  bool json = false;
  bool quiet = false;
  bool verbose = false;
  std::wstring report;           ///< name of the library's report file; empty: none
  unsigned stall_timeout_s = 0;  ///< 0: never
};

/// Text to print instead of doing anything: --help or --version.
struct HelpText {
  std::string text;
};

/// Reads the command line.
/// @param args UTF-8, without the program's name
/// @throws Failure with ExitCode::kUsage when the line makes no sense
std::variant<Arguments, HelpText> ParseCommandLine(const std::vector<std::string>& args);

}  // namespace cli

#endif  // RCVLINK_CLI_ARGUMENTS_H_
