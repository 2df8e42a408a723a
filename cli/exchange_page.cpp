#include "exchange_page.h"

#include <algorithm>
#include <array>
#include <span>

#include "exchange_text.h"
#include "formats.h"
#include "text.h"
#include "troubleshooting.h"

namespace cli {
namespace {

constexpr std::string_view kHead = R"(<!DOCTYPE html>
<html lang="en">
<head>
<meta charset="utf-8">
<meta http-equiv="Content-Security-Policy" content="default-src 'none'; style-src 'unsafe-inline'">
<meta name="viewport" content="width=device-width, initial-scale=1">
<meta name="color-scheme" content="light dark">
<style>
:root { color-scheme: light dark; --back: #fff; --text: #1d2329; --weak: #66707a; --line: #d9dee3;
  --host: #7a4fb5; --command: #1f6fc4; --reply: #23854a; --blocks: #13808c; --retry: #a86100;
  --failure: #c22f2f; --failure-back: #fdeeee; --retry-back: #fff5e2; }
@media (prefers-color-scheme: dark) {
  :root { --back: #15191d; --text: #e3e7eb; --weak: #98a3ad; --line: #343c44; --host: #b894ec;
    --command: #6aaef5; --reply: #5dc788; --blocks: #4fc3cf; --retry: #f0b04c; --failure: #ff8080;
    --failure-back: #3a1e20; --retry-back: #362a13; } }
body { margin: 0 auto; max-width: 76rem; padding: 1.2rem; background: var(--back);
  color: var(--text); font: 15px/1.45 system-ui, "Segoe UI", sans-serif; }
h1 { font-size: 1.35rem; margin: 0 0 .2rem; overflow-wrap: anywhere; }
h2 { font-size: 1.05rem; margin: 1.6rem 0 .4rem; }
p { margin: .2rem 0; } .weak, .code, .line { color: var(--weak); }
.remark { background: var(--retry-back); border-left: 3px solid var(--retry); padding: .3rem .6rem; }
svg { width: 100%; height: auto; display: block; }
svg text { fill: var(--weak); font: 12px system-ui, "Segoe UI", sans-serif; }
svg rect { stroke: var(--back); stroke-width: .6; }
svg .grid { stroke: var(--line); }
svg, table { min-width: 46rem; }
table { border-collapse: collapse; width: 100%; table-layout: fixed; }
th { text-align: left; color: var(--weak); font-weight: 600; position: sticky; top: 0;
  background: var(--back); }
th, td { padding: .16rem .5rem; border-bottom: 1px solid var(--line); vertical-align: top;
  overflow-wrap: anywhere; }
.time { width: 6.6rem; font-variant-numeric: tabular-nums; white-space: nowrap; }
.gap { width: 5.2rem; text-align: right; font-variant-numeric: tabular-nums; white-space: nowrap; }
.thread { width: 4rem; } .left { width: 36%; }
.long { font-weight: 700; }
b { font-weight: 600; margin-right: .35em; }
.host b, .done b, .cancel b { color: var(--host); } .command b { color: var(--command); }
.reply b { color: var(--reply); } .blocks b { color: var(--blocks); }
tr.retry { background: var(--retry-back); } .retry b { color: var(--retry); }
tr.timeout, tr.failure { background: var(--failure-back); }
.timeout b, .failure b { color: var(--failure); }
.note td, .link td, .lock td, .read td, .send td { color: var(--weak); }
.code { display: block; }
.line { display: none; font: 12px/1.4 Consolas, "Liberation Mono", monospace; max-height: 8em;
  overflow: auto; }
#lines:checked ~ table .line { display: block; }
#lines:checked ~ table tr.send { display: table-row; } tr.send { display: none; }
pre { white-space: pre-wrap; margin: .2rem 0 .6rem; font: inherit; }
.fill-host { fill: var(--host); } .fill-command { fill: var(--command); }
.fill-reply { fill: var(--reply); } .fill-blocks { fill: var(--blocks); }
.fill-retry { fill: var(--retry); } .fill-failure { fill: var(--failure); }
</style>
)";

using Entries = std::span<const ExchangeEntry>;

struct Lane {
  std::string_view name;
  std::string_view color;
};
enum LaneIndex : size_t {
  kHostLane,
  kCommandLane,
  kReplyLane,
  kBlockLane,
  kRetryLane,
  kFailureLane
};
constexpr std::array kLanes = {Lane{"Host", "host"},
                               Lane{"Commands", "command"},
                               Lane{"Replies", "reply"},
                               Lane{"Blocks", "blocks"},
                               Lane{"Retries", "retry"},
                               Lane{"Failures", "failure"}};

constexpr uint64_t kWidth = 1000;
constexpr uint64_t kLeft = 80;  // of the lanes; their names stand before
constexpr uint64_t kRight = 985;
constexpr uint64_t kTop = 6;
constexpr uint64_t kLaneHeight = 22;
constexpr uint64_t kBarHeight = 14;
constexpr uint64_t kTextDrop = 11;  // from a bar's top to its text's base line
constexpr uint64_t kAxisDrop = 16;

std::string Attribute(std::string_view name, uint64_t value) {
  return " " + std::string(name) + "=\"" + std::to_string(value) + "\"";
}

// The time line.
class Drawing {
 public:
  explicit Drawing(Entries entries)
      : entries_(entries), duration_(std::max<uint64_t>(entries.back().elapsed_ms, 1)) {}

  std::string Draw() {
    const uint64_t bottom = kTop + kLanes.size() * kLaneHeight;
    svg_ = "<svg viewBox=\"0 0 " + std::to_string(kWidth) + " " +
           std::to_string(bottom + kAxisDrop + kTop) +
           "\" role=\"img\" aria-label=\"Time line\">\n";
    DrawAxis(bottom);
    for (size_t i = 0; i < kLanes.size(); ++i) {
      svg_ += "<text x=\"0\"" + Attribute("y", TopOf(i) + kTextDrop) + ">" +
              std::string(kLanes[i].name) + "</text>\n";
    }
    for (size_t i = 0; i < entries_.size(); ++i) DrawEntry(i);
    return svg_ + "</svg>\n";
  }

 private:
  static uint64_t TopOf(size_t lane) { return kTop + lane * kLaneHeight; }
  uint64_t XOf(uint64_t elapsed_ms) const {
    return kLeft + elapsed_ms * (kRight - kLeft) / duration_;
  }

  // 1, 2 or 5 with zeros: a step that makes some ten marks.
  uint64_t Step() const {
    constexpr uint64_t kMostMarks = 12;
    constexpr uint64_t kTen = 10;
    constexpr std::array<uint64_t, 3> kDigits = {1, 2, 5};
    for (uint64_t power = 1;; power *= kTen) {
      for (const uint64_t digit : kDigits) {
        if (duration_ / (digit * power) <= kMostMarks) return digit * power;
      }
    }
  }

  void DrawAxis(uint64_t bottom) {
    const uint64_t step = Step();
    for (uint64_t ms = 0; ms <= duration_; ms += step) {
      const uint64_t x = XOf(ms);
      svg_ += "<line class=\"grid\"" + Attribute("x1", x) + Attribute("x2", x) +
              Attribute("y1", kTop) + Attribute("y2", bottom) + "/>";
      const std::string text = step % kMsPerSecond == 0 ? std::to_string(ms / kMsPerSecond) + " s"
                                                        : std::to_string(ms) + " ms";
      svg_ += "<text text-anchor=\"middle\"" + Attribute("x", x) +
              Attribute("y", bottom + kAxisDrop) + ">" + text + "</text>\n";
    }
  }

  void DrawBar(LaneIndex lane,
               std::string_view color,
               uint64_t from_ms,
               uint64_t until_ms,
               const ExchangeEntry& entry) {
    constexpr uint64_t kThinnest = 3;
    const uint64_t x = XOf(from_ms);
    svg_ += "<rect class=\"fill-" + std::string(color) + "\"" + Attribute("x", x) +
            Attribute("y", TopOf(lane)) +
            Attribute("width", std::max(XOf(until_ms) - x, kThinnest)) +
            Attribute("height", kBarHeight) + " rx=\"2\"><title>" + TimeOfDay(entry.ms_of_day) +
            "  " + Escaped(entry.meaning) + "</title></rect>\n";
  }

  static std::string_view ColorOf(ExchangeEnd end, std::string_view color) {
    if (end == ExchangeEnd::kCancelled) return "retry";
    return end == ExchangeEnd::kTimeout || end == ExchangeEnd::kFailure ? "failure" : color;
  }

  // An operation of the host lasts until the thread's next one.
  uint64_t EndOfOperation(size_t index) const {
    uint64_t end = entries_[index].elapsed_ms;
    for (const ExchangeEntry& next : entries_.subspan(index + 1)) {
      if (next.thread != entries_[index].thread) continue;
      end = next.elapsed_ms;
      if (next.kind == TraceKind::kHost) break;
    }
    return end;
  }

  void DrawEntry(size_t index) {
    const ExchangeEntry& entry = entries_[index];
    const uint64_t at = entry.elapsed_ms;
    const uint64_t until = entry.until_ms.value_or(at);
    switch (entry.kind) {
      case TraceKind::kHost:
        DrawBar(kHostLane, "host", at, EndOfOperation(index), entry);
        break;
      case TraceKind::kCommand:
        DrawBar(kCommandLane, ColorOf(entry.end, "command"), at, until, entry);
        // The chunks of a Velmar receiver have no lines of their own.
        if (CommandClass(entry.text) == "CReadFileCmd") {
          DrawBar(kBlockLane, ColorOf(entry.end, "blocks"), at, until, entry);
        }
        break;
      case TraceKind::kReply:
        DrawBar(kReplyLane, "reply", at, at, entry);
        break;
      case TraceKind::kBlocks:
        DrawBar(kBlockLane, ColorOf(entry.end, "blocks"), at, until, entry);
        break;
      case TraceKind::kRetry:
        DrawBar(kRetryLane, "retry", at, at, entry);
        break;
      case TraceKind::kTimeout:
      case TraceKind::kFailure:
        DrawBar(kFailureLane, "failure", at, at, entry);
        break;
      default:
        break;
    }
  }

  Entries entries_;
  uint64_t duration_;
  std::string svg_;
};

// The sign before the meaning: an arrow, or a word for a failure.
std::string_view SignOf(TraceKind kind) {
  switch (kind) {
    case TraceKind::kHost:
    case TraceKind::kCancel:
    case TraceKind::kCommand:
    case TraceKind::kSend:
      return "&rarr;";
    case TraceKind::kDone:
    case TraceKind::kReply:
      return "&larr;";
    case TraceKind::kRetry:
      return "&rarr; Retry";
    case TraceKind::kTimeout:
      return "Time-out";
    case TraceKind::kFailure:
      return "Failure";
    default:
      return "";
  }
}

// Whether it is between the host and the library, not between the library and the receiver.
bool IsOfHost(TraceKind kind) {
  return kind == TraceKind::kHost || kind == TraceKind::kCancel || kind == TraceKind::kDone ||
         kind == TraceKind::kNote || kind == TraceKind::kLock;
}

std::string Row(const ExchangeEntry& entry) {
  constexpr uint64_t kLongGapMs = 1000;
  const std::string_view sign = SignOf(entry.kind);
  std::string words;
  if (!sign.empty()) words += "<b>" + std::string(sign) + "</b>";
  words += Escaped(entry.meaning);
  if (entry.code) {
    words += "<span class=\"code\">" + HexCode(*entry.code) + " " + Escaped(TitleOf(*entry.code)) +
             "</span>";
  }
  if (!entry.text.empty()) words += "<code class=\"line\">" + Escaped(entry.text) + "</code>";
  const std::string cells =
      IsOfHost(entry.kind) ? "<td>" + words + "</td><td></td>" : "<td></td><td>" + words + "</td>";
  return "<tr class=\"" + std::string(NameOf(entry.kind)) + "\"><td class=\"time\">" +
         TimeOfDay(entry.ms_of_day) + "</td><td class=\"gap" +
         (entry.since_ms >= kLongGapMs ? " long" : "") + "\">" + Gap(entry.since_ms) +
         "</td><td class=\"thread\">" + std::to_string(entry.thread) + "</td>" + cells + "</tr>\n";
}

std::string CodeSection(const Exchange& exchange) {
  std::string section;
  for (const long code : exchange.Codes()) {
    const auto entry = FindTroubleshooting(code);
    section += "<details><summary>" + HexCode(code) + " " + Escaped(TitleOf(code)) + "</summary>" +
               "<pre>" + (entry ? Escaped(entry->text) : "This code has no entry.") +
               "</pre></details>\n";
  }
  return section.empty() ? "" : "<h2>Result codes</h2>\n" + section;
}

}  // namespace

std::string Escaped(std::string_view text) {
  std::string escaped;
  for (const char character : text) {
    switch (character) {
      case '&':
        escaped += "&amp;";
        break;
      case '<':
        escaped += "&lt;";
        break;
      case '>':
        escaped += "&gt;";
        break;
      case '"':
        escaped += "&quot;";
        break;
      case '\'':
        escaped += "&#39;";
        break;
      default:
        escaped += character;
    }
  }
  return escaped;
}

std::string ToPage(const Exchange& exchange, const std::string& title) {
  const Entries entries(exchange.entries.data(),
                        std::min(exchange.entries.size(), kMostPageEntries));
  std::string page(kHead);
  page += "<title>" + Escaped(title) + "</title>\n</head>\n<body>\n<h1>" + Escaped(title) +
          "</h1>\n<p class=\"weak\">" + Escaped(Summary(exchange)) + "</p>\n";
  for (const std::string& remark : exchange.remarks) {
    page += "<p class=\"remark\">" + Escaped(remark) + "</p>\n";
  }
  if (entries.size() < exchange.entries.size()) {
    page += "<p class=\"remark\">The page shows the first " + std::to_string(entries.size()) +
            " of " + std::to_string(exchange.entries.size()) + " entries.</p>\n";
  }
  if (entries.empty()) return page + "</body>\n</html>\n";
  page += "<h2>Time line</h2>\n" + Drawing(entries).Draw() +
          "<p class=\"weak\">Red: failed. Amber: cancelled or requested again. Point at a bar to "
          "see more.</p>\n" +
          CodeSection(exchange) +
          "<h2>Exchange</h2>\n<input type=\"checkbox\" id=\"lines\"> "
          "<label for=\"lines\">Show the lines of the report</label>\n<table>\n<thead><tr>"
          "<th class=\"time\">Time</th><th class=\"gap\">After</th><th class=\"thread\">Thread</th>"
          "<th class=\"left\">Host &harr; library</th><th>Library &harr; receiver</th>"
          "</tr></thead>\n<tbody>\n";
  for (const ExchangeEntry& entry : entries) page += Row(entry);
  return page + "</tbody>\n</table>\n</body>\n</html>\n";
}

}  // namespace cli
