#include "simulator/velmar/file_logs.h"

#include <array>
#include <chrono>
#include <cstdint>
#include <cstdio>
#include <ctime>

namespace sim {
namespace {

// Where and how the file was recorded.
constexpr const char* kFirstAndLastEpoch = ",2290,169200.000,2290,172800.000";
constexpr const char* kSite = ",\"HILL\",\"P-7, north pillar\",\"VA-12\",\"A00417\",1.5520";
constexpr const char* kRecording = ",30.00,5.0,\"Night crew, team 2\"";
constexpr const char* kPosition = ",46.5000000,7.2500000,612.4000";
constexpr const char* kRemark = ",\"\"";

// "yyyymmdd,hhmmss" in UTC.
std::string DateAndTime(std::time_t time) {
  const std::chrono::sys_seconds seconds{std::chrono::seconds(time)};
  const auto day = std::chrono::floor<std::chrono::days>(seconds);
  const std::chrono::year_month_day date(day);
  const std::chrono::hh_mm_ss clock(seconds - day);
  std::array<char, 64> text{};
  std::snprintf(text.data(),
                text.size(),
                "%04d%02u%02u,%02d%02d%02d",
                static_cast<int>(date.year()),
                static_cast<unsigned>(date.month()),
                static_cast<unsigned>(date.day()),
                static_cast<int>(clock.hours().count()),
                static_cast<int>(clock.minutes().count()),
                static_cast<int>(clock.seconds().count()));
  return text.data();
}

std::string Quoted(const std::string& text) { return '"' + text + '"'; }

}  // namespace

std::vector<AsciiLog> DirectoryLogs(const std::vector<FileEntry>& files, bool quoted_names) {
  std::vector<AsciiLog> logs;
  for (const FileEntry& file : files) {
    const std::string name = quoted_names ? Quoted(file.name) : file.name;
    // Between size and date there is a mark for a file that is being written. No file is.
    logs.push_back(
        {"DIRENTA", name + "," + std::to_string(file.size) + ",0," + DateAndTime(file.modified)});
  }
  return logs;
}

AsciiLog FileHeaderLog(const FileEntry& file, const VelmarIdentity& identity) {
  std::string body = Quoted(file.name) + "," + std::to_string(file.size);
  body += "," + DateAndTime(file.modified) + kFirstAndLastEpoch + kSite;
  body += "," + Quoted(identity.model) + "," + Quoted(identity.id) + ",\"VMR040100\"";
  body += std::string(kRecording) + kPosition + kRemark + ",0";
  return {"FILEHDRA", body};
}

}  // namespace sim
