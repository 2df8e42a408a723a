#include "simulator/files.h"

#include <algorithm>
#include <chrono>
#include <fstream>
#include <utility>

namespace sim {
namespace {

std::time_t ModifiedAt(const std::filesystem::directory_entry& file) {
  const auto system_time = std::chrono::file_clock::to_sys(file.last_write_time());
  const auto seconds = std::chrono::floor<std::chrono::seconds>(system_time.time_since_epoch());
  return static_cast<std::time_t>(seconds.count());
}

std::optional<Bytes> ReadDisk(const std::filesystem::path& path, uint64_t offset, size_t count) {
  std::ifstream stream(path, std::ios::binary);
  stream.seekg(static_cast<std::streamoff>(offset));
  Bytes bytes(count);
  if (count > 0) {
    stream.read(reinterpret_cast<char*>(bytes.data()), static_cast<std::streamsize>(count));
  }
  if (!stream) {
    return std::nullopt;
  }
  return bytes;
}

std::optional<Bytes> ReadMemory(const Bytes& content, uint64_t offset, size_t count) {
  if (offset > content.size() || count > content.size() - offset) {
    return std::nullopt;
  }
  const auto begin = content.begin() + static_cast<std::ptrdiff_t>(offset);
  return Bytes(begin, begin + static_cast<std::ptrdiff_t>(count));
}

}  // namespace

FileStore FileStore::FromFolder(const std::filesystem::path& folder) {
  FileStore store;
  for (const auto& file : std::filesystem::directory_iterator(folder)) {
    if (file.is_regular_file()) {
      const std::u8string name = file.path().filename().u8string();
      FileEntry entry{std::string(name.begin(), name.end()), file.file_size(), ModifiedAt(file)};
      store.files_.push_back({std::move(entry), file.path()});
    }
  }
  std::sort(store.files_.begin(), store.files_.end(), [](const Served& left, const Served& right) {
    return left.entry.name < right.entry.name;
  });
  return store;
}

void FileStore::Add(std::string name, Bytes content, std::time_t modified) {
  FileEntry entry{std::move(name), content.size(), modified};
  files_.push_back({std::move(entry), std::move(content)});
}

std::vector<FileEntry> FileStore::List() const {
  std::vector<FileEntry> entries;
  entries.reserve(files_.size());
  for (const Served& file : files_) {
    entries.push_back(file.entry);
  }
  return entries;
}

std::optional<FileEntry> FileStore::Find(const std::string& name) const {
  for (const Served& file : files_) {
    if (file.entry.name == name) {
      return file.entry;
    }
  }
  return std::nullopt;
}

std::optional<Bytes> FileStore::Read(const std::string& name, uint64_t offset, size_t count) const {
  for (const Served& file : files_) {
    if (file.entry.name != name) {
      continue;
    }
    if (const auto* path = std::get_if<std::filesystem::path>(&file.content)) {
      return ReadDisk(*path, offset, count);
    }
    return ReadMemory(std::get<Bytes>(file.content), offset, count);
  }
  return std::nullopt;
}

bool FileStore::Remove(const std::string& name) {
  return std::erase_if(files_, [&](const Served& file) { return file.entry.name == name; }) > 0;
}

bool FileStore::Rename(const std::string& name, const std::string& new_name) {
  if (Find(new_name)) {
    return false;
  }
  for (Served& file : files_) {
    if (file.entry.name == name) {
      file.entry.name = new_name;
      return true;
    }
  }
  return false;
}

}  // namespace sim
