#include "velmar/log_header.h"

#include <algorithm>
#include <cstdlib>
#include <vector>

#include "velmar/fields.h"

namespace VelmarCommands {

std::optional<AsciiHeader> ParseHeaderFields(std::string_view text) {
  constexpr size_t kHeaderFields = 10;
  const std::vector<std::wstring> fields = SplitFields(text);
  if (fields.size() < kHeaderFields) return std::nullopt;
  return AsciiHeader{.message_name = fields[0],
                     .port = fields[1],
                     .sequence = ToInteger(fields[2]),
                     .gps_week = ToInteger(fields[5]),
                     .gps_seconds = _wtof(fields[6].c_str())};
}

void BinaryHeader::Assign(std::string_view log) {
  std::copy_n(log.begin(), kLength, bytes_.begin());
}

}  // namespace VelmarCommands
