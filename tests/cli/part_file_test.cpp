#include "part_file.h"

#include <gtest/gtest.h>

#include "paths.h"
#include "temporary_folder.h"

namespace cli {
namespace {

class PartFileTest : public testing::Test {
 protected:
  std::filesystem::path Target() const { return folder_.path() / L"a"; }

  TemporaryFolder folder_;
};

TEST_F(PartFileTest, GetsItsNameWhenItIsComplete) {
  {
    PartFile part(Target(), {});
    EXPECT_TRUE(folder_.Has(L"a.part"));
    EXPECT_EQ(part.Write("hello", 5), DWORD{ERROR_SUCCESS});
    EXPECT_FALSE(folder_.Has(L"a"));
    part.Complete();
  }
  EXPECT_EQ(folder_.Read(L"a"), "hello");
  EXPECT_FALSE(folder_.Has(L"a.part"));
}

TEST_F(PartFileTest, VanishesUnlessItIsKept) {
  {
    PartFile part(Target(), {});
    part.Write("hello", 5);
  }
  EXPECT_FALSE(folder_.Has(L"a"));
  EXPECT_FALSE(folder_.Has(L"a.part"));
}

TEST_F(PartFileTest, AnIncompleteFileCanBeKept) {
  std::wstring path;
  {
    PartFile part(Target(), {});
    part.Write("hel", 3);
    path = part.KeepIncomplete();
  }
  EXPECT_EQ(path, Target().native() + L".part");
  EXPECT_EQ(folder_.Read(L"a.part"), "hel");
  EXPECT_FALSE(folder_.Has(L"a"));
}

// A long download must not be lost because its name exists.
TEST_F(PartFileTest, ACompleteFileSurvivesARenameThatFails) {
  folder_.Write(L"a", "precious");
  {
    PartFile part(Target(), {});
    part.Write("hello", 5);
    try {
      part.Complete();
      ADD_FAILURE() << "replaced a file";
    } catch (const Failure& failure) {
      EXPECT_EQ(failure.exit, ExitCode::kLocalFile);
      EXPECT_TRUE(failure.kept.ends_with("a.part")) << failure.kept;
    }
  }
  EXPECT_EQ(folder_.Read(L"a"), "precious");
  EXPECT_EQ(folder_.Read(L"a.part"), "hello");
}

TEST_F(PartFileTest, OverwritesWhenItMay) {
  folder_.Write(L"a", "old");
  {
    PartFile part(Target(), {.part = true, .target = true});
    part.Write("new", 3);
    part.Complete();
  }
  EXPECT_EQ(folder_.Read(L"a"), "new");
}

TEST_F(PartFileTest, LeavesAnothersPartAlone) {
  folder_.Write(L"a.part", "another's");
  EXPECT_THROW(PartFile(Target(), {}), Failure);
  EXPECT_EQ(folder_.Read(L"a.part"), "another's");
}

TEST_F(PartFileTest, TwoDownloadsCannotShareAPart) {
  const PartFile first(Target(), {});
  EXPECT_THROW(PartFile(Target(), {.part = true, .target = true}), Failure);
}

TEST_F(PartFileTest, ReportsWhyItCannotBeMade) {
  try {
    const PartFile part(folder_.path() / L"none" / L"a", {});
    ADD_FAILURE() << "was made";
  } catch (const Failure& failure) {
    EXPECT_EQ(failure.exit, ExitCode::kLocalFile);
    EXPECT_EQ(failure.code, ResultOfWin32(ERROR_PATH_NOT_FOUND));
  }
}

TEST_F(PartFileTest, FoldersAreMadeWithThoseAbove) {
  const std::filesystem::path deep = folder_.path() / L"b" / L"c";
  MakeFolder(deep);
  EXPECT_TRUE(IsFolder(deep));
  MakeFolder(deep);
  folder_.Write(L"file", "");
  EXPECT_THROW(MakeFolder(folder_.path() / L"file"), Failure);
}

}  // namespace
}  // namespace cli
