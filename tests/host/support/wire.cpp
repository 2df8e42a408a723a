#include "tests/host/support/wire.h"

#include <algorithm>
#include <regex>
#include <sstream>

namespace host {
namespace {

std::string Masked(const std::string& line) {
  static const std::regex reply(R"(^< (RE|ER)[0-9A-Fa-f]{3}%\d+%)");
  static const std::regex command(R"(^> %\d+%)");
  static const std::regex crc(R"( crc=[0-9A-F]{4})");
  std::string masked = std::regex_replace(line, reply, "< $1%#%");
  masked = std::regex_replace(masked, command, "> %#%");
  return std::regex_replace(masked, crc, "");
}

}  // namespace

Lines WireLines(const std::string& transcript, size_t first) {
  Lines lines;
  std::istringstream text(transcript);
  std::string line;
  for (size_t number = 0; std::getline(text, line); ++number) {
    if (number >= first) lines.push_back(Masked(line));
  }
  return lines;
}

Lines SentByHost(const std::string& transcript, size_t first) {
  Lines sent;
  for (const std::string& line : WireLines(transcript, first)) {
    if (line.starts_with("> ")) sent.push_back(line.substr(2));
  }
  return sent;
}

std::vector<int> TagsOf(const std::string& transcript) {
  static const std::regex tag(R"(^> %(\d+)%)");
  std::vector<int> tags;
  std::istringstream text(transcript);
  std::string line;
  std::smatch match;
  while (std::getline(text, line)) {
    if (std::regex_search(line, match, tag)) tags.push_back(std::stoi(match[1]));
  }
  return tags;
}

size_t CountOf(const Lines& lines, std::string_view line) {
  return static_cast<size_t>(std::ranges::count(lines, line));
}

size_t CountStarting(const Lines& lines, std::string_view start) {
  return static_cast<size_t>(
      std::ranges::count_if(lines, [&](const auto& line) { return line.starts_with(start); }));
}

Lines HandshakeOfHost() {
  return {R"(\n)",
          R"(#OFF#\r\n)",
          R"(dm\r\n)",
          R"(%#%\r\n)",
          R"(%#%print,/cur/term\r\n)",
          R"(set,/par/dev/ser/a/echo,/dev/null\r\n)"};
}

}  // namespace host
