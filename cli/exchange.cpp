#include "exchange.h"

#include <windows.h>

#include <algorithm>
#include <limits>
#include <map>
#include <utility>

#include "formats.h"
#include "results.h"
#include "text.h"
#include "trace_lines.h"
#include "troubleshooting.h"

namespace cli {
namespace {
constexpr uint32_t kMsPerMinute = 60 * kMsPerSecond;
constexpr uint32_t kMsPerHour = 60 * kMsPerMinute;
constexpr uint32_t kMsPerDay = 24 * kMsPerHour;

std::optional<std::wstring> Decoded(const std::string& bytes, UINT code_page, DWORD flags) {
  if (bytes.empty()) return std::wstring();
  const int length = static_cast<int>(bytes.size());
  const int size = MultiByteToWideChar(code_page, flags, bytes.data(), length, nullptr, 0);
  if (size <= 0) return std::nullopt;
  std::wstring text(static_cast<size_t>(size), L'\0');
  MultiByteToWideChar(code_page, flags, bytes.data(), length, text.data(), size);
  return text;
}

bool IsBeyondAscii(const std::string& bytes) {
  return std::ranges::any_of(bytes, [](char byte) { return static_cast<signed char>(byte) < 0; });
}

// Lines as text, and whether all were UTF-8.
class Decoder {
 public:
  explicit Decoder(UINT code_page) : code_page_(code_page) {}

  std::string Decode(const std::string& bytes) {
    if (const auto text = Decoded(bytes, CP_UTF8, MB_ERR_INVALID_CHARS)) return Printable(*text);
    all_utf8_ = false;
    // A character that was cut at the end of the line becomes the code page's replacement
    // character.
    const auto text = Decoded(bytes, code_page_, 0);
    return text ? Printable(*text) : std::to_string(bytes.size()) + " bytes that cannot be read";
  }

  bool all_utf8() const { return all_utf8_; }

 private:
  UINT code_page_;
  bool all_utf8_ = true;
};

// What a thread is doing, according to its lines so far.
struct ThreadState {
  const Family* family = nullptr;
  std::optional<size_t> command{};    // the entry of the command that is not ended
  std::optional<size_t> read{};       // the entry of the read that is not ended
  std::optional<size_t> blocks{};     // the entry of the transfer that is not ended
  std::optional<uint64_t> sent_ms{};  // when the command was sent
  bool blocks_follow = false;         // the receiver has agreed to send blocks
  bool opening = false;               // a port is being opened
  std::string last_class{};           // of the last command that the report names
};

class Reader {
 public:
  explicit Reader(UINT code_page) : decoder_(code_page) {}

  Exchange Read(std::string_view report) {
    const TraceLines trace = SplitTrace(report);
    for (const TraceLine& line : trace.lines) Add(line);
    AddRemarks(trace, report);
    return std::move(exchange_);
  }

 private:
  ExchangeEntry& At(size_t index) { return exchange_.entries[index]; }

  void Add(const TraceLine& line) {
    ExchangeEntry entry{
        .ms_of_day = line.ms_of_day, .thread = line.thread, .text = decoder_.Decode(line.bytes)};
    Advance(entry);
    TraceWords words = WordsOf(entry.text);
    entry.kind = words.kind;
    entry.meaning = std::move(words.meaning);
    entry.code = words.code;

    ThreadState& thread = threads_[line.thread];
    if (const Family* const family = FamilyOf(entry.text)) thread.family = family;
    EndRead(thread, entry);
    EndCommand(thread, entry);
    EndBlocks(thread, entry);
    if (entry.kind == TraceKind::kSend) {
      TakeSend(thread, entry);
    } else {
      Begin(thread, entry);
    }
    Push(std::move(entry));
  }

  // Gives the entry its time. Midnight may have passed, or the clock may have been set.
  void Advance(ExchangeEntry& entry) {
    if (!exchange_.entries.empty()) {
      const uint32_t before = last_ms_of_day_;
      const bool is_back = entry.ms_of_day < before;
      const bool is_next_day = is_back && before - entry.ms_of_day > kMsPerDay / 2;
      if (is_back && !is_next_day) clock_was_set_ = true;
      if (!is_back || is_next_day) {
        elapsed_ms_ += entry.ms_of_day + (is_next_day ? kMsPerDay : 0) - before;
      }
    }
    last_ms_of_day_ = entry.ms_of_day;
    entry.elapsed_ms = elapsed_ms_;
  }

  void Push(ExchangeEntry entry) {
    entry.since_ms = exchange_.entries.empty() ? 0 : entry.elapsed_ms - last_shown_ms_;
    if (entry.kind != TraceKind::kSend) last_shown_ms_ = entry.elapsed_ms;
    if (entry.kind == TraceKind::kCancel) last_cancel_ = exchange_.entries.size();
    exchange_.entries.push_back(std::move(entry));
  }

  // How something that began with the entry `begin` ended, by the thread's next line.
  ExchangeEnd EndBy(const ExchangeEntry& next, size_t begin) const {
    if (next.kind == TraceKind::kTimeout) return ExchangeEnd::kTimeout;
    if (next.kind == TraceKind::kFailure) return ExchangeEnd::kFailure;
    if (last_cancel_ && *last_cancel_ > begin) return ExchangeEnd::kCancelled;
    return ExchangeEnd::kReply;
  }

  // Adds an entry for what has no line in the report: a reply before the thread's next line, or a
  // cancelled wait.
  void PushEnd(ExchangeEnd end,
               const ExchangeEntry& next,
               uint64_t begin_ms,
               std::string_view what) {
    const std::string passed = std::to_string(next.elapsed_ms - begin_ms) + " ms";
    ExchangeEntry entry{
        .ms_of_day = next.ms_of_day, .elapsed_ms = next.elapsed_ms, .thread = next.thread};
    if (end == ExchangeEnd::kReply) {
      entry.kind = TraceKind::kReply;
      entry.meaning = std::string(what) + " within " + passed;
    } else if (end == ExchangeEnd::kCancelled) {
      entry.kind = TraceKind::kRead;
      entry.meaning = "the wait was cancelled after " + passed;
    } else {
      return;
    }
    Push(std::move(entry));
  }

  void EndRead(ThreadState& thread, const ExchangeEntry& next) {
    if (!thread.read) return;
    const size_t read = *std::exchange(thread.read, std::nullopt);
    const ExchangeEnd end = EndBy(next, read);
    const uint64_t begin_ms = At(read).elapsed_ms;
    if (next.kind == TraceKind::kRead) {
      PushEnd(end, next, begin_ms, "part of a reply, or a reply to another command,");
      return;
    }
    PushEnd(end, next, begin_ms, "a reply");
    FinishCommand(thread, next, end);
  }

  void FinishCommand(ThreadState& thread, const ExchangeEntry& next, ExchangeEnd end) {
    if (!thread.command) return;
    ExchangeEntry& command = At(*std::exchange(thread.command, std::nullopt));
    command.until_ms = next.elapsed_ms;
    command.end = end;
    thread.sent_ms.reset();
    thread.blocks_follow = end == ExchangeEnd::kReply && thread.last_class == "CGetFileCmd";
  }

  // A command whose reads are not in the report ends with the thread's next line.
  void EndCommand(ThreadState& thread, const ExchangeEntry& next) {
    if (!thread.command) return;
    const bool is_failure = next.kind == TraceKind::kFailure || next.kind == TraceKind::kTimeout;
    if (!is_failure && (!thread.sent_ms || next.kind == TraceKind::kRead)) return;
    // After a Velmar receiver's reply the library pauses for 500 ms; timers may be a little early.
    constexpr uint64_t kRestMs = 450;
    const uint64_t sent_ms = thread.sent_ms.value_or(next.elapsed_ms);
    const bool is_answered =
        thread.family && thread.family->rests && next.elapsed_ms - sent_ms >= kRestMs;
    ExchangeEnd end = EndBy(next, *thread.command);
    if (end == ExchangeEnd::kReply && !is_answered) end = ExchangeEnd::kUntold;
    PushEnd(end, next, sent_ms, "a reply, and a pause of 500 ms,");
    FinishCommand(thread, next, end);
  }

  static bool IsOfTransfer(const ExchangeEntry& entry) {
    return entry.kind == TraceKind::kSend ||
           entry.text.find("::DownloadOver") != std::string::npos ||
           entry.text.find("::Read - ") != std::string::npos;
  }

  void EndBlocks(ThreadState& thread, const ExchangeEntry& next) {
    if (IsOfTransfer(next)) return;
    thread.blocks_follow = false;
    if (!thread.blocks) return;
    const size_t index = *std::exchange(thread.blocks, std::nullopt);
    const ExchangeEnd end = EndBy(next, index);
    PushEnd(end, next, At(index).elapsed_ms, "the blocks ended");
    At(index).until_ms = next.elapsed_ms;
    At(index).end = end;
  }

  // "Flush" comes before every command and before every block that is requested again.
  void TakeSend(ThreadState& thread, ExchangeEntry& entry) {
    if (thread.blocks) {
      entry.kind = TraceKind::kRetry;
      entry.meaning = "the block is requested again";
    } else if (thread.blocks_follow) {
      entry.kind = TraceKind::kBlocks;
      entry.meaning = "the first block is requested";
      thread.blocks = exchange_.entries.size();
    } else if (thread.opening) {
      entry.kind = TraceKind::kLink;
    } else if (!thread.command && thread.last_class == "CSetPortParamsCmd") {
      entry.kind = TraceKind::kLink;
      entry.meaning = "waits until the command is sent";
    } else if (!thread.command) {
      entry.kind = TraceKind::kCommand;
      entry.meaning = UnnamedCommand(thread) + " (not named)";
      thread.command = exchange_.entries.size();
      thread.sent_ms = entry.elapsed_ms;
    } else {
      thread.sent_ms = entry.elapsed_ms;
    }
  }

  // Guesses a command that has no line of its own from the one before it.
  static std::string UnnamedCommand(ThreadState& thread) {
    const std::string before = std::exchange(thread.last_class, "");
    if (before == "CEchoOffCmd") return "stop all output: dm";
    if (before == "CGetPortCmd") return "set the port: set,/par/dev/...";
    if (before == "CSetInterfacemodeCommand" || before == "CReadFileCmd") {
      return "stop all logs: unlogall thisport";
    }
    return thread.family ? thread.family->unnamed_command : "a command";
  }

  void Begin(ThreadState& thread, ExchangeEntry& entry) {
    const size_t index = exchange_.entries.size();
    if (entry.kind == TraceKind::kRead) {
      thread.read = index;
    } else if (entry.kind == TraceKind::kCommand) {
      thread.last_class = CommandClass(entry.text);
      entry.meaning = CommandMeaning(thread.last_class, thread.family);
      thread.command = index;
      thread.sent_ms.reset();
    } else if (entry.kind == TraceKind::kHost) {
      thread.last_class.clear();
      thread.command.reset();  // it was made and never sent
      thread.opening = entry.text.find(" - opening ") != std::string::npos;
    } else if (entry.kind == TraceKind::kLink) {
      thread.last_class.clear();
      thread.opening = false;
    }
  }

  void AddRemarks(const TraceLines& trace, std::string_view report) {
    auto& remarks = exchange_.remarks;
    if (report.starts_with("\xFF\xFE") || report.starts_with("\xFE\xFF")) {
      remarks.push_back("The file is UTF-16, so an editor has changed it.");
    }
    if (trace.bytes_before != 0) {
      remarks.push_back("The first " + std::to_string(trace.bytes_before) +
                        " bytes are not part of a report.");
    }
    if (trace.lines.empty()) return;
    // A line with bytes beyond ASCII may have lost its end, so a missing one is no sign of a cut.
    const TraceLine& last = trace.lines.back();
    if (!last.has_end && !IsBeyondAscii(last.bytes)) {
      remarks.push_back("The report ends in the middle of its last line.");
    }
    if (!decoder_.all_utf8()) {
      remarks.push_back(
          "Text that is not UTF-8 is shown in this computer's code page and may be wrong.");
    }
    if (clock_was_set_) remarks.push_back("The clock was set back during the report.");
  }

  Decoder decoder_;
  Exchange exchange_;
  std::map<uint32_t, ThreadState> threads_;
  std::optional<size_t> last_cancel_;
  uint64_t elapsed_ms_ = 0;
  uint64_t last_shown_ms_ = 0;
  uint32_t last_ms_of_day_ = 0;
  bool clock_was_set_ = false;
};

}  // namespace

size_t Exchange::Count(TraceKind kind) const {
  return static_cast<size_t>(
      std::ranges::count_if(entries, [kind](const auto& entry) { return entry.kind == kind; }));
}

uint64_t Exchange::DurationMs() const { return entries.empty() ? 0 : entries.back().elapsed_ms; }

std::vector<long> Exchange::Codes() const {
  std::vector<long> codes;
  for (const ExchangeEntry& entry : entries) {
    if (entry.code && !std::ranges::count(codes, *entry.code)) codes.push_back(*entry.code);
  }
  return codes;
}

std::string TimeOfDay(uint32_t ms_of_day) {
  const auto digits = [](uint32_t value, size_t width) {
    std::string text = std::to_string(value);
    return std::string(width - std::min(width, text.size()), '0') + text;
  };
  constexpr size_t kTwo = 2;
  constexpr size_t kThree = 3;
  return digits(ms_of_day / kMsPerHour, kTwo) + ":" +
         digits(ms_of_day % kMsPerHour / kMsPerMinute, kTwo) + ":" +
         digits(ms_of_day % kMsPerMinute / kMsPerSecond, kTwo) + "." +
         digits(ms_of_day % kMsPerSecond, kThree);
}

std::string TitleOf(long code) {
  const auto entry = FindTroubleshooting(code);
  return entry ? entry->title : MeaningOf(code);
}

Exchange ReadExchange(std::string_view report, unsigned code_page) {
  return Reader(code_page).Read(report);
}

}  // namespace cli
