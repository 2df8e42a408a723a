// The files that a receiver serves.
#ifndef SIMULATOR_FILES_H_
#define SIMULATOR_FILES_H_

#include <cstddef>
#include <cstdint>
#include <ctime>
#include <filesystem>
#include <optional>
#include <string>
#include <variant>
#include <vector>

#include "simulator/bytes.h"

namespace sim {

struct FileEntry {
  std::string name;
  uint64_t size = 0;
  std::time_t modified = 0;
};

// The files a receiver serves: those of a folder, or ones made up in memory. Removing or renaming a
// file changes what is served; nothing on disk is ever changed.
class FileStore {
 public:
  FileStore() = default;

  // Takes the plain files of `folder` as they are now, in the order of their names. Throws
  // std::filesystem::filesystem_error if the folder cannot be read.
  static FileStore FromFolder(const std::filesystem::path& folder);

  // Adds a file that exists in memory only, after those already there.
  void Add(std::string name, Bytes content, std::time_t modified);

  std::vector<FileEntry> List() const;

  std::optional<FileEntry> Find(const std::string& name) const;

  // Reads `count` bytes at `offset`; nothing if the file is not served or gives fewer bytes.
  std::optional<Bytes> Read(const std::string& name, uint64_t offset, size_t count) const;

  // False if no such file is served.
  bool Remove(const std::string& name);

  // False if no such file is served, or another one has the new name.
  bool Rename(const std::string& name, const std::string& new_name);

 private:
  struct Served {
    FileEntry entry;
    std::variant<std::filesystem::path, Bytes> content;
  };

  std::vector<Served> files_;
};

}  // namespace sim

#endif  // SIMULATOR_FILES_H_
