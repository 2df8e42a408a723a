#include "velmar/logs.h"

#include <array>
#include <new>
#include <optional>

#include "velmar/fields.h"

namespace VelmarCommands {
namespace {

// Whether a body whose field 0 counts its items has all their fields. In 64 bits, since a damaged
// log may give any count.
bool HasAllItems(const std::vector<std::wstring>& fields, int count, int64_t fields_an_item) {
  return static_cast<int64_t>(fields.size()) >= count * fields_an_item + 1;
}

// Dates (yyyymmdd) and times of day (hhmmss) are three numbers in one.
struct Triple {
  WORD high;
  WORD middle;
  WORD low;
};
Triple SplitDecimal(int number) {
  return {static_cast<WORD>(number / 10000),
          static_cast<WORD>(number % 10000 / 100),
          static_cast<WORD>(number % 100)};
}

SYSTEMTIME TimeOf(int date, int time) {
  const Triple day = SplitDecimal(date);
  const Triple clock = SplitDecimal(time);
  return SYSTEMTIME{.wYear = day.high,
                    .wMonth = day.middle,
                    .wDayOfWeek = 0,
                    .wDay = day.low,
                    .wHour = clock.high,
                    .wMinute = clock.middle,
                    .wSecond = clock.low,
                    .wMilliseconds = 0};
}

// Makes commas of line ends, ";" and "*", so that all logs of a directory are one row of fields.
std::string WithCommasOnly(std::string_view text) {
  std::string plain;
  plain.reserve(text.size());
  for (size_t i = 0; i < text.size(); ++i) {
    if (text.substr(i).starts_with("\r\n")) {
      plain += ',';
      ++i;
    } else if (text[i] == ';' || text[i] == '*') {
      plain += ',';
    } else {
      plain += text[i];
    }
  }
  return plain;
}

// The position of a word in a list; none for a word that is not in it.
template <size_t N>
std::optional<uint8_t> NumberOf(const std::wstring& word,
                                const std::array<std::wstring_view, N>& words) {
  for (size_t i = 0; i < N; ++i) {
    if (word == words[i]) return static_cast<uint8_t>(i);
  }
  return std::nullopt;
}

}  // namespace

Progress DecodeVersion(std::string_view body, VersionLog& log) {
  constexpr int kComponentFields = 8;
  if (body.empty()) return Progress::kNothing;
  const std::vector<std::wstring> fields = SplitFields(body);
  if (fields.empty()) return Progress::kNothing;
  const int count = ToInteger(fields[0]);
  if (!HasAllItems(fields, count, kComponentFields)) return Progress::kMore;
  for (int k = 0; k < count; ++k) {
    const auto field = [&](size_t i) -> const std::wstring& {
      return fields[i + static_cast<size_t>(k) * kComponentFields];
    };
    const std::wstring& type = field(1);
    if (type == L"GPSCARD") {
      log.model = field(2);
      log.serial_number = field(3);
      log.hardware_version = field(4);
      log.software_version = field(5);
    } else if (type == L"DB_USERAPPAUTO" || type == L"ENCLOSURE") {
      log.model = field(2);
    }
  }
  for (std::wstring* text :
       {&log.model, &log.serial_number, &log.hardware_version, &log.software_version}) {
    *text = WithoutQuotes(*text);
  }
  return Progress::kComplete;
}

Progress DecodeDirectory(std::string_view text, FileEntries& entries) {
  constexpr size_t kLogFields = 16;  // 10 of the header, 5 of the body, the checksum
  entries.clear();
  const std::vector<std::wstring> fields = SplitFields(WithCommasOnly(text));
  if (fields.empty()) return Progress::kNothing;
  std::optional<int> previous;
  for (size_t i = 0; i < fields.size();) {
    if (fields[i] != L"#DIRENTA") {
      ++i;
      continue;
    }
    // One field more: only the line end after the checksum shows that the log is whole.
    if (fields.size() <= i + kLogFields) return Progress::kMore;
    try {
      entries.push_back({.name = WithoutQuotes(fields[i + 10]),
                         .size = static_cast<uint32_t>(ToInteger(fields[i + 11])),
                         .time = TimeOf(ToInteger(fields[i + 13]), ToInteger(fields[i + 14]))});
    } catch (const std::bad_alloc&) {
      return Progress::kNoMemory;
    }
    const int sequence = ToInteger(fields[i + 2]);
    if (previous && int64_t{sequence} + 1 != *previous) return Progress::kContradiction;
    if (sequence == 0) return Progress::kComplete;
    previous = sequence;
    i += kLogFields;
  }
  return Progress::kMoreLogs;
}

Progress DecodeFileHeader(std::string_view body, FileHeaderLog& log) {
  constexpr size_t kHeaderFields = 23;
  const std::vector<std::wstring> fields = SplitFields(body);
  if (fields.size() < kHeaderFields) return Progress::kMore;
  log.file_name = fields[0];
  log.file_size = ToInteger(fields[1]);
  return Progress::kComplete;
}

Progress DecodePortConfig(std::string_view body, std::wstring_view port, PortConfigLog& log) {
  constexpr int kPortFields = 11;
  constexpr std::array<std::wstring_view, 3> kParityWords = {L"N", L"E", L"O"};
  constexpr std::array<std::wstring_view, 3> kHandshakeWords = {L"N", L"XON", L"CTS"};
  if (body.empty()) return Progress::kNothing;
  const std::vector<std::wstring> fields = SplitFields(body);
  if (fields.empty()) return Progress::kNothing;
  const int count = ToInteger(fields[0]);
  if (!HasAllItems(fields, count, kPortFields)) return Progress::kMore;
  for (int k = 0; k < count; ++k) {
    const auto field = [&](size_t i) -> const std::wstring& {
      return fields[i + static_cast<size_t>(k) * kPortFields];
    };
    if (field(1) != port) continue;
    log.port_name = field(1);
    log.baud = ToInteger(field(2));
    log.parity = NumberOf(field(3), kParityWords).value_or(log.parity);
    log.data_bits = static_cast<uint8_t>(ToInteger(field(4)));
    log.stop_bits = static_cast<uint8_t>(ToInteger(field(5)));
    log.handshake = NumberOf(field(6), kHandshakeWords).value_or(log.handshake);
  }
  return Progress::kComplete;
}

}  // namespace VelmarCommands
