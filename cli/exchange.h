// A report as an exchange between the host, the library and a receiver.
#ifndef RCVLINK_CLI_EXCHANGE_H_
#define RCVLINK_CLI_EXCHANGE_H_

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "trace_words.h"

namespace cli {

// How a command or the blocks of a file ended.
enum class ExchangeEnd {
  kUntold,  // no reply is expected, or the report ends before it
  kReply,   // a reply that the library accepted
  kTimeout,
  kFailure,
  kCancelled,
};

struct ExchangeEntry {
  uint32_t ms_of_day = 0;
  uint64_t elapsed_ms = 0;  // since the report's first line
  // Since the entry before it. A kSend does not count, as it is not always shown.
  uint64_t since_ms = 0;
  uint32_t thread = 0;
  TraceKind kind = TraceKind::kNote;
  std::string text{};     // the line, printable UTF-8; empty for a reply, which has no line
  std::string meaning{};  // printable UTF-8
  std::optional<long> code{};
  std::optional<uint64_t> until_ms{};  // commands and blocks: when they ended, as elapsed_ms
  ExchangeEnd end = ExchangeEnd::kUntold;
};

struct Exchange {
  std::vector<ExchangeEntry> entries{};
  std::vector<std::string> remarks{};  // what is wrong with the report, as sentences

  size_t Count(TraceKind kind) const;
  uint64_t DurationMs() const;
  // The result codes in it, each once.
  std::vector<long> Codes() const;
};

// "12:30:01.250"
std::string TimeOfDay(uint32_t ms_of_day);

// What a code means, from docs/troubleshooting.md or else from Windows.
std::string TitleOf(long code);

// Reads as much of a report as can be read. A text without any stamp has no entries.
// `code_page`: of text that is not UTF-8.
Exchange ReadExchange(std::string_view report, unsigned code_page);

}  // namespace cli

#endif  // RCVLINK_CLI_EXCHANGE_H_
