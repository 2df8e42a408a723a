// The entries of docs/troubleshooting.md, which is built into the program.
#ifndef RCVLINK_CLI_TROUBLESHOOTING_H_
#define RCVLINK_CLI_TROUBLESHOOTING_H_

#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace cli {

struct TroubleshootingEntry {
  long code = 0;
  std::string title{};
  std::string text{};  // ends with a line end
};

// The entries of a page in which each has a heading "## 0x8007048F title".
std::vector<TroubleshootingEntry> ReadTroubleshooting(std::string_view page);

// All that the program has.
std::vector<TroubleshootingEntry> TroubleshootingEntries();

// The entry of a result code; nothing when it has none.
std::optional<TroubleshootingEntry> FindTroubleshooting(long code);

// A result code as people write it: 0x8007048F, -2147023729 or 2147943567.
std::optional<long> ParseCode(std::string_view text);

}  // namespace cli

#endif  // RCVLINK_CLI_TROUBLESHOOTING_H_
