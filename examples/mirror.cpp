// Updates a folder with a receiver's files: downloads those that are missing or of another size, and
// sets their times. The receiver's clock is taken as UTC.
//   mirror COM7 D:\survey
// Exit code: 0 all files are here, 1 not all, 2 wrong usage.
#include <cstdio>
#include <exception>
#include <filesystem>
#include <stdexcept>
#include <system_error>

#include "rcvlink.hpp"

namespace fs = std::filesystem;

// Whether the name leads to a file of that name in the folder. It may be "..\x", a device, or a stream.
static bool IsPlain(const fs::path& folder, const fs::path& name) {
  return name.native().find_first_of(L":/\\") == std::wstring::npos &&
         fs::absolute(folder / name) == fs::absolute(folder) / name;
}

static bool IsHere(const fs::path& target, const rcvlink::File& file) {
  std::error_code missing;
  return fs::file_size(target, missing) == file.size && !missing;
}

static bool Update(rcvlink::Receiver& receiver,
                   const fs::path& folder,
                   const rcvlink::File& file) try {
  const fs::path target = folder / file.name;
  if (!IsPlain(folder, file.name)) throw std::runtime_error("Windows has no such file name");
  if (IsHere(target, file)) return true;
  receiver.Download(file, target, {.set_time = true});
  std::printf("%ls: downloaded\n", file.name.c_str());
  return true;
} catch (const std::exception& error) {
  std::printf("%ls: %s\n", file.name.c_str(), error.what());
  return false;
}

int wmain(int argc, wchar_t** argv) try {
  if (argc != 3) return std::puts("usage: mirror PORT FOLDER"), 2;

  const fs::path folder = argv[2];
  fs::create_directories(folder);
  auto receiver = rcvlink::Receiver::Find(argv[1]);
  bool all = true;
  for (const rcvlink::File& file : receiver.Files()) {
    if (Update(receiver, folder, file)) continue;
    all = false;
    if (!receiver.Answers()) throw std::runtime_error("the receiver no longer answers");
  }
  return all ? 0 : 1;
} catch (const std::exception& error) {
  std::printf("not all files are here: %s\n", error.what());
  return 1;
}
