// Reports whose path is about as long as a path can be.
#include <gtest/gtest.h>

#include <array>
#include <string>
#include <vector>

#include "platform/handle.h"
#include "platform/win32.h"
#include "report/report_file.h"

using rcvlink::FileHandle;
using rcvlink::Trace;

namespace {

// With its ending zero the longest path has MAX_PATH characters.
constexpr size_t kLongestPath = MAX_PATH - 1;

std::wstring TempFolder() {
  std::array<wchar_t, MAX_PATH> folder{};
  GetTempPathW(MAX_PATH, folder.data());
  return folder.data();
}

// The files of the folder whose names begin with this text.
std::vector<std::wstring> FilesWith(const std::wstring& start) {
  std::vector<std::wstring> names;
  WIN32_FIND_DATAW found{};
  const HANDLE search = FindFirstFileW((TempFolder() + start + L"*").c_str(), &found);
  if (search == INVALID_HANDLE_VALUE) return names;
  do {
    names.emplace_back(found.cFileName);
  } while (FindNextFileW(search, &found));
  FindClose(search);
  return names;
}

class ReportPath : public testing::Test {
 protected:
  ~ReportPath() override {
    dump_hlp::CloseReportFile();
    for (const std::wstring& name : FilesWith(start_)) DeleteFileW((TempFolder() + name).c_str());
  }

  // A name that gives the path this length, without its ending zero.
  std::wstring NameForPathOf(size_t length) const {
    std::wstring name = start_;
    name.resize(length - TempFolder().size(), L'p');
    return name;
  }
  std::vector<std::wstring> Files() const { return FilesWith(start_); }
  // The content of a report after one line was written and the report was closed.
  static std::string Written(const std::wstring& name) {
    Trace(L"line\r\n");
    dump_hlp::CloseReportFile();
    const FileHandle file(CreateFileW((TempFolder() + name).c_str(),
                                      GENERIC_READ,
                                      FILE_SHARE_READ,
                                      nullptr,
                                      OPEN_EXISTING,
                                      0,
                                      nullptr));
    std::array<char, 100> text{};
    DWORD count = 0;
    ReadFile(file.get(), text.data(), text.size(), &count, nullptr);
    return {text.data(), count};
  }

  const std::wstring start_ = L"rcvlink-path-" + std::to_wstring(GetCurrentProcessId()) + L"-";
};

class ReportPathThatFits : public ReportPath, public testing::WithParamInterface<size_t> {};

TEST_P(ReportPathThatFits, IsMadeAndWritten) {
  const std::wstring name = NameForPathOf(GetParam());
  dump_hlp::CreateReportFile(name.c_str());
  EXPECT_EQ(Files(), std::vector<std::wstring>{name});
  EXPECT_TRUE(Written(name).ends_with(" line\r\n"));
}

TEST_P(ReportPathThatFits, IsMadeUnderANarrowNameToo) {
  const std::wstring name = NameForPathOf(GetParam());
  dump_hlp::CreateReportFile(std::string(name.begin(), name.end()).c_str());
  EXPECT_EQ(Files(), std::vector<std::wstring>{name});
  EXPECT_TRUE(Written(name).ends_with(" line\r\n"));
}

INSTANTIATE_TEST_SUITE_P(Lengths,
                         ReportPathThatFits,
                         testing::Values(kLongestPath - 1, kLongestPath));

class ReportPathThatDoesNotFit : public ReportPath, public testing::WithParamInterface<size_t> {};

// No file is made, not even under a shortened name.
TEST_P(ReportPathThatDoesNotFit, LeavesReportingOff) {
  const std::wstring name = NameForPathOf(GetParam());
  dump_hlp::CreateReportFile(name.c_str());
  EXPECT_NO_THROW(Trace(L"lost\r\n"));
  EXPECT_EQ(Files(), std::vector<std::wstring>{});
  dump_hlp::CreateReportFile(std::string(name.begin(), name.end()).c_str());
  EXPECT_EQ(Files(), std::vector<std::wstring>{});
}

TEST_P(ReportPathThatDoesNotFit, EndsTheReportBefore) {
  const std::wstring before = start_ + L"before";
  dump_hlp::CreateReportFile(before.c_str());
  dump_hlp::CreateReportFile(NameForPathOf(GetParam()).c_str());
  EXPECT_EQ(Written(before), "");
}

// A report can be made again.
TEST_P(ReportPathThatDoesNotFit, IsNotTheEndOfReports) {
  dump_hlp::CreateReportFile(NameForPathOf(GetParam()).c_str());
  const std::wstring after = start_ + L"after";
  dump_hlp::CreateReportFile(after.c_str());
  EXPECT_TRUE(Written(after).ends_with(" line\r\n"));
}

INSTANTIATE_TEST_SUITE_P(Lengths,
                         ReportPathThatDoesNotFit,
                         testing::Values(kLongestPath + 1, kLongestPath + 2));

}  // namespace
