#include "local_files.h"

#include <algorithm>
#include <array>

#include "handle.h"
#include "paths.h"
#include "sha256.h"
#include "text.h"

namespace cli {
namespace {

constexpr size_t kPiece = 65'536;

// Throws Failure.
UniqueHandle Open(const std::filesystem::path& file,
                  DWORD access,
                  DWORD disposition,
                  const std::string& tried) {
  UniqueHandle handle(CreateFileW(
      file.c_str(), access, FILE_SHARE_READ, nullptr, disposition, FILE_ATTRIBUTE_NORMAL, nullptr));
  if (handle.get() != INVALID_HANDLE_VALUE) return handle;
  const DWORD error = GetLastError();
  throw LocalFailure(tried + " " + Printable(file.native()), error);
}

// Reads a file from its beginning.
class FileReader {
 public:
  explicit FileReader(const std::filesystem::path& file)
      : file_(file), handle_(Open(file, GENERIC_READ, OPEN_EXISTING, "read")) {}

  // The next bytes, as many as there is room for; fewer only at the end.
  template <size_t size>
  DWORD Read(std::array<char, size>& bytes) {
    DWORD count = 0;
    if (!ReadFile(handle_.get(), bytes.data(), static_cast<DWORD>(size), &count, nullptr)) {
      const DWORD error = GetLastError();
      throw LocalFailure("read " + Printable(file_.native()), error);
    }
    return count;
  }

 private:
  const std::filesystem::path& file_;
  UniqueHandle handle_;
};

}  // namespace

std::optional<uint64_t> SizeOf(const std::filesystem::path& file) {
  constexpr unsigned kHighPart = 32;
  WIN32_FILE_ATTRIBUTE_DATA data{};
  if (!GetFileAttributesExW(file.c_str(), GetFileExInfoStandard, &data)) {
    return std::nullopt;
  }
  return uint64_t{data.nFileSizeHigh} << kHighPart | data.nFileSizeLow;
}

bool BeginsWith(const std::filesystem::path& file, const std::filesystem::path& beginning) {
  FileReader whole(file);
  FileReader start(beginning);
  std::array<char, kPiece> expected;
  std::array<char, kPiece> bytes;
  for (;;) {
    const DWORD wanted = start.Read(expected);
    if (wanted == 0) return true;
    const DWORD count = whole.Read(bytes);
    if (count < wanted || !std::equal(expected.begin(), expected.begin() + wanted, bytes.begin())) {
      return false;
    }
  }
}

std::string Sha256Of(const std::filesystem::path& file) {
  FileReader reader(file);
  Sha256 hash;
  std::array<char, kPiece> bytes;
  while (const DWORD count = reader.Read(bytes)) hash.Add(bytes.data(), count);
  return hash.Finish();
}

void MakeEmpty(const std::filesystem::path& file) {
  Open(file, GENERIC_WRITE, CREATE_ALWAYS, "create");
}

void MoveOver(const std::filesystem::path& from, const std::filesystem::path& target) {
  constexpr DWORD kHow = MOVEFILE_REPLACE_EXISTING | MOVEFILE_WRITE_THROUGH;
  if (MoveFileExW(from.c_str(), target.c_str(), kHow)) return;
  const DWORD error = GetLastError();
  throw LocalFailure("replace " + Printable(target.native()), error);
}

std::string InWords(TimeZone zone) {
  if (zone == TimeZone::kUtc) return "UTC";
  TIME_ZONE_INFORMATION information{};
  GetTimeZoneInformation(&information);
  return "the local time of this computer (" + Printable(information.StandardName) + ")";
}

std::optional<FILETIME> ToFileTime(const SYSTEMTIME& time,
                                   TimeZone zone,
                                   const TIME_ZONE_INFORMATION* local) {
  SYSTEMTIME utc = time;
  if (zone == TimeZone::kLocal && !TzSpecificLocalTimeToSystemTime(local, &time, &utc)) {
    return std::nullopt;
  }
  FILETIME file_time{};
  if (!SystemTimeToFileTime(&utc, &file_time)) return std::nullopt;
  return file_time;
}

void SetTime(const std::filesystem::path& file, const FILETIME& time) {
  const std::string tried = "set the time of";
  const UniqueHandle handle = Open(file, FILE_WRITE_ATTRIBUTES, OPEN_EXISTING, tried);
  if (SetFileTime(handle.get(), nullptr, nullptr, &time)) return;
  const DWORD error = GetLastError();
  throw LocalFailure(tried + " " + Printable(file.native()), error);
}

}  // namespace cli
