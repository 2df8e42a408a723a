#include "exchange_text.h"

#include <algorithm>
#include <set>

#include "formats.h"
#include "text.h"

namespace cli {
namespace {

std::string Seconds(uint64_t ms) {
  constexpr uint64_t kMsPerTenth = 100;
  return std::to_string(ms / kMsPerSecond) + "." + std::to_string(ms % kMsPerSecond / kMsPerTenth) +
         " s";
}

std::string Counted(size_t count, const std::string& one, const std::string& many) {
  if (count == 0) return "no " + many;
  return std::to_string(count) + " " + (count == 1 ? one : many);
}

// The mark before a line; failures stand out in capitals.
std::string MarkOf(TraceKind kind) {
  switch (kind) {
    case TraceKind::kRetry:
      return "RETRY";
    case TraceKind::kTimeout:
      return "TIMEOUT";
    case TraceKind::kFailure:
      return "FAILURE";
    default:
      return std::string(NameOf(kind));
  }
}

bool HasThreads(const Exchange& exchange) {
  std::set<uint32_t> threads;
  for (const ExchangeEntry& entry : exchange.entries) threads.insert(entry.thread);
  return threads.size() > 1;
}

std::string LineOf(const ExchangeEntry& entry, bool with_thread) {
  constexpr size_t kGapWidth = 9;
  constexpr size_t kMarkWidth = 8;
  constexpr size_t kPartiesWidth = 21;
  constexpr size_t kThreadWidth = 7;
  std::string line = TimeOfDay(entry.ms_of_day) + PadLeft(Gap(entry.since_ms), kGapWidth) + "  ";
  if (with_thread) line += PadRight(std::to_string(entry.thread), kThreadWidth);
  line += PadRight(MarkOf(entry.kind), kMarkWidth) +
          PadRight(PartiesOf(entry.kind), kPartiesWidth) + entry.meaning;
  if (entry.code) line += " (" + HexCode(*entry.code) + ", " + TitleOf(*entry.code) + ")";
  return line + "\n";
}

}  // namespace

std::string PartiesOf(TraceKind kind) {
  switch (kind) {
    case TraceKind::kHost:
    case TraceKind::kCancel:
      return "host -> library";
    case TraceKind::kDone:
      return "host <- library";
    case TraceKind::kCommand:
    case TraceKind::kSend:
    case TraceKind::kRetry:
      return "library -> receiver";
    case TraceKind::kReply:
      return "library <- receiver";
    default:
      return "";
  }
}

std::string Gap(uint64_t ms) {
  if (ms == 0) return "";
  return "+" + (ms < kMsPerSecond ? std::to_string(ms) + " ms" : Seconds(ms));
}

std::string Summary(const Exchange& exchange) {
  return Seconds(exchange.DurationMs()) + ", " +
         Counted(exchange.Count(TraceKind::kCommand), "command", "commands") + ", " +
         Counted(exchange.Count(TraceKind::kRetry), "retry", "retries") + ", " +
         Counted(exchange.Count(TraceKind::kTimeout), "time-out", "time-outs") + ", " +
         Counted(exchange.Count(TraceKind::kFailure), "failure", "failures");
}

std::string ToText(const Exchange& exchange, bool verbose) {
  const bool with_threads = HasThreads(exchange);
  std::string text;
  for (const ExchangeEntry& entry : exchange.entries) {
    if (entry.kind == TraceKind::kSend && !verbose) continue;  // the command's line says it
    text += LineOf(entry, with_threads);
    if (verbose && !entry.text.empty()) text += "    | " + entry.text + "\n";
  }
  text += "\n" + Summary(exchange) + "\n";
  for (const long code : exchange.Codes()) {
    text += HexCode(code) + "  " + TitleOf(code) + "; `rcvlink-cli explain " + HexCode(code) +
            "` says what to try\n";
  }
  return text;
}

}  // namespace cli
