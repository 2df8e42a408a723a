#include "tests/host/support/temp_folder.h"

#include <fstream>
#include <iterator>

namespace bed {

std::filesystem::path ToWindowsPath(const std::string& unix_path) {
  const std::u8string text(unix_path.begin(), unix_path.end());
  return std::filesystem::path(u8"Z:" + text).make_preferred();
}

std::string ToUnixPath(const std::filesystem::path& windows_path) {
  const std::u8string text = std::filesystem::absolute(windows_path).generic_u8string();
  if (!text.starts_with(u8"Z:") && !text.starts_with(u8"z:")) {
    throw Error("not on drive Z: " + windows_path.string());
  }
  return std::string(text.begin() + 2, text.end());
}

TempFolder::TempFolder()
    : unix_path_(connection_.Request({{"do", "folder"}}).at("path").get<std::string>()),
      path_(ToWindowsPath(unix_path_)) {}

void TempFolder::Write(const std::string& name, const std::string& content) const {
  constexpr char kDigits[] = "0123456789abcdef";
  std::string hex;
  hex.reserve(2 * content.size());
  for (const char byte : content) {
    const auto value = static_cast<unsigned char>(byte);
    hex += kDigits[value >> 4];
    hex += kDigits[value & 0xF];
  }
  connection_.Request({{"do", "write"}, {"path", unix_path_ + "/" + name}, {"bytes", hex}});
}

std::string TempFolder::Read(const std::string& name) const {
  std::ifstream file(path_ / name, std::ios::binary);
  if (!file) throw Error("cannot read " + (path_ / name).string());
  return std::string(std::istreambuf_iterator<char>(file), {});
}

}  // namespace bed
