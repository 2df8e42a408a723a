#include "troubleshooting.h"

#include <algorithm>
#include <charconv>
#include <cstdint>
#include <limits>

#include "text.h"
#include "troubleshooting_page.h"

namespace cli {
namespace {

template <typename T>
std::optional<T> ParseNumber(std::string_view text, int base) {
  T number = 0;
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, number, base);
  if (error != std::errc() || stop != end) return std::nullopt;
  return number;
}

std::string_view Trimmed(std::string_view text) {
  constexpr std::string_view kBlank = " \r\n";
  const size_t first = std::min(text.find_first_not_of(kBlank), text.size());
  return text.substr(first, text.find_last_not_of(kBlank) + 1 - first);
}

}  // namespace

std::vector<TroubleshootingEntry> ReadTroubleshooting(std::string_view page) {
  constexpr std::string_view kHeading = "\n## ";
  std::vector<TroubleshootingEntry> entries;
  for (size_t begin = page.find(kHeading); begin != std::string_view::npos;) {
    const size_t next = page.find(kHeading, begin + 1);
    const std::string_view section =
        page.substr(begin + kHeading.size(), next - begin - kHeading.size());
    const std::string_view heading = section.substr(0, section.find('\n'));
    const size_t blank = std::min(heading.find(' '), heading.size());
    if (const auto code = ParseCode(heading.substr(0, blank))) {
      entries.push_back({.code = *code,
                         .title = std::string(Trimmed(heading.substr(blank))),
                         .text = std::string(Trimmed(section.substr(heading.size()))) + "\n"});
    }
    begin = next;
  }
  return entries;
}

std::vector<TroubleshootingEntry> TroubleshootingEntries() {
  return ReadTroubleshooting(kTroubleshootingPage);
}

std::optional<TroubleshootingEntry> FindTroubleshooting(long code) {
  for (TroubleshootingEntry& entry : TroubleshootingEntries()) {
    if (entry.code == code) return std::move(entry);
  }
  return std::nullopt;
}

std::optional<long> ParseCode(std::string_view text) {
  constexpr int kHexBase = 16;
  constexpr int kDecimalBase = 10;
  const std::string lowered = Lowered(std::string(text));
  const auto number = lowered.starts_with("0x")
                          ? ParseNumber<int64_t>(std::string_view(lowered).substr(2), kHexBase)
                          : ParseNumber<int64_t>(lowered, kDecimalBase);
  if (!number || *number < std::numeric_limits<int32_t>::min() ||
      *number > std::numeric_limits<uint32_t>::max()) {
    return std::nullopt;
  }
  return static_cast<long>(static_cast<uint32_t>(*number));
}

}  // namespace cli
