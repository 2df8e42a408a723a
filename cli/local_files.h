// Files of this computer as a mirror sees them: sizes, bytes, times.
#ifndef RCVLINK_CLI_LOCAL_FILES_H_
#define RCVLINK_CLI_LOCAL_FILES_H_

#include <windows.h>

#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>

namespace cli {

// Nothing when there is no such file.
std::optional<uint64_t> SizeOf(const std::filesystem::path& file);

// Whether a file's first bytes are all those of another one.
// Throws Failure when one of them cannot be read.
bool BeginsWith(const std::filesystem::path& file, const std::filesystem::path& beginning);

// 64 hexadecimal digits in small letters; empty when Windows could not compute it.
// Throws Failure when the file cannot be read.
std::string Sha256Of(const std::filesystem::path& file);

// Creates an empty file; replaces an existing one.
// Throws Failure.
void MakeEmpty(const std::filesystem::path& file);

// Renames a file over another one.
// Throws Failure.
void MoveOver(const std::filesystem::path& from, const std::filesystem::path& target);

// In which zone a receiver's clock is.
enum class TimeZone { kUtc, kLocal };

// "UTC" or "the local time of this computer (W. Europe Standard Time)"
std::string InWords(TimeZone zone);

// Nothing for a missing or invalid time.
// `local`: what local time is; null: that of this computer.
std::optional<FILETIME> ToFileTime(const SYSTEMTIME& time,
                                   TimeZone zone,
                                   const TIME_ZONE_INFORMATION* local = nullptr);

// Gives a file the time of its last change.
// Throws Failure.
void SetTime(const std::filesystem::path& file, const FILETIME& time);

}  // namespace cli

#endif  // RCVLINK_CLI_LOCAL_FILES_H_
