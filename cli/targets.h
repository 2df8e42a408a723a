// Where downloads go.
#ifndef RCVLINK_CLI_TARGETS_H_
#define RCVLINK_CLI_TARGETS_H_

#include <cstdint>
#include <filesystem>
#include <optional>
#include <string>
#include <vector>

namespace cli {

// Where the user wants the downloads.
struct Place {
  std::wstring output{};  // a folder or a file; may be empty
  bool many = false;      // more than one download: `output` is a folder
  bool force = false;     // files may be overwritten
};

// Chooses the local file of each download, and refuses those that would do harm.
class Targets {
 public:
  explicit Targets(const Place& place);

  // Checks whether files can be made in the folder. Leaves nothing there.
  // Throws Failure.
  void CheckFolder() const;

  // Checks whether the disk has room for so many bytes.
  // Throws Failure.
  void CheckRoom(uint64_t bytes) const;

  // The file for a name of the receiver.
  // Throws Failure when the name is impossible, the file or its ".part" exists already and may not
  //         be overwritten, or an earlier name has taken it.
  std::filesystem::path Choose(const std::wstring& name);

  // The existing file for a name of the receiver; nothing when there is none. Later names cannot
  // use it.
  // Throws Failure when the name is impossible, or an earlier name has taken the file.
  std::optional<std::filesystem::path> TakeExisting(const std::wstring& name);

  // The folder of the targets; empty for the current one, and when the user named a file.
  const std::filesystem::path& folder() const { return folder_; }

 private:
  std::filesystem::path PathOf(const std::wstring& name) const;
  std::filesystem::path ExistingFolder() const;
  std::filesystem::path FreePathOf(const std::wstring& name) const;
  bool IsTaken(const std::filesystem::path& target) const;

  bool force_;
  std::filesystem::path file_;  // of a single download; else empty
  std::filesystem::path folder_;
  std::vector<std::filesystem::path> chosen_;
};

}  // namespace cli

#endif  // RCVLINK_CLI_TARGETS_H_
