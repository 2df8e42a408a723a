#include "targets.h"

#include <gtest/gtest.h>

#include "paths.h"
#include "temporary_folder.h"

namespace cli {
namespace {

class TargetsTest : public testing::Test {
 protected:
  // The place for downloads in the test's folder.
  Place Into(const std::wstring& output = L"") const {
    return {.output = (folder_.path() / output).native()};
  }

  TemporaryFolder folder_;
};

void ExpectRefusal(Targets& targets, const std::wstring& name) {
  try {
    targets.Choose(name);
    ADD_FAILURE() << "was not refused";
  } catch (const Failure& failure) {
    EXPECT_EQ(failure.exit, ExitCode::kLocalFile);
    EXPECT_LT(failure.code, 0);
  }
}

TEST_F(TargetsTest, ASingleFileMayBeNamed) {
  Targets targets(Into(L"monday.dat"));
  EXPECT_EQ(targets.Choose(L"a"), folder_.path() / L"monday.dat");
  EXPECT_TRUE(targets.folder().empty());
}

TEST_F(TargetsTest, AnExistingFolderIsAFolder) {
  Targets targets(Into());
  EXPECT_EQ(targets.Choose(L"a"), folder_.path() / L"a");
}

TEST_F(TargetsTest, AFolderIsMeantBySeparatorAndByMany) {
  Targets separator(Into(L"new/"));
  EXPECT_EQ(separator.Choose(L"a"), folder_.path() / L"new" / L"a");
  Place place = Into(L"new");
  place.many = true;
  Targets many(place);
  EXPECT_EQ(many.Choose(L"c"), folder_.path() / L"new" / L"c");
}

TEST_F(TargetsTest, WithoutOutputItIsTheCurrentFolder) {
  Targets targets(Place{});
  EXPECT_EQ(targets.Choose(L"no such file"), L"no such file");
}

TEST_F(TargetsTest, NoNameLeavesTheFolder) {
  Targets targets(Into());
  for (const wchar_t* name :
       {L"..", L"..\\a", L"../../b", L"C:\\c", L"\\\\h\\s\\d", L"NUL", L"e:f"}) {
    EXPECT_EQ(targets.Choose(name).parent_path(), folder_.path()) << name;
  }
  ExpectRefusal(targets, L"");
}

TEST_F(TargetsTest, AnExistingFileIsKeptUnlessForced) {
  folder_.Write(L"a", "precious");
  Targets targets(Into());
  ExpectRefusal(targets, L"a");
  Place place = Into();
  place.force = true;
  Targets forced(place);
  EXPECT_EQ(forced.Choose(L"a"), folder_.path() / L"a");
}

TEST_F(TargetsTest, WhatAnEarlierDownloadLeftIsKeptUnlessForced) {
  folder_.Write(L"a.part", "what came");
  Targets targets(Into());
  ExpectRefusal(targets, L"a");
  Place place = Into();
  place.force = true;
  Targets forced(place);
  EXPECT_EQ(forced.Choose(L"a"), folder_.path() / L"a");
}

TEST_F(TargetsTest, FoldersThatCanBeMadeAreAccepted) {
  EXPECT_NO_THROW(Targets(Into()).CheckFolder());
  EXPECT_NO_THROW(Targets(Into(L"new\\deep\\")).CheckFolder());
  EXPECT_NO_THROW(Targets(Into(L"a.dat")).CheckFolder());
  EXPECT_NO_THROW(Targets(Place{}).CheckFolder());
  EXPECT_TRUE(std::filesystem::is_empty(folder_.path()));
}

TEST_F(TargetsTest, FoldersThatCannotBeMadeAreRefused) {
  folder_.Write(L"file", "");
  for (const wchar_t* output :
       {L"file\\deep\\", L"file\\a.dat", L"none\\a.dat", L"a?b", L"a?b\\"}) {
    EXPECT_THROW(Targets(Into(output)).CheckFolder(), Failure) << output;
  }
}

TEST_F(TargetsTest, TheDiskMustHaveRoom) {
  constexpr uint64_t kTooMuch = uint64_t{1} << 62;
  EXPECT_NO_THROW(Targets(Into(L"new\\")).CheckRoom(1));
  EXPECT_THROW(Targets(Into(L"new\\")).CheckRoom(kTooMuch), Failure);
  EXPECT_THROW(Targets(Into(L"a.dat")).CheckRoom(kTooMuch), Failure);
}

TEST_F(TargetsTest, AFolderIsNeverOverwritten) {
  MakeFolder(folder_.path() / L"a");
  Place place = Into();
  place.force = true;
  Targets targets(place);
  ExpectRefusal(targets, L"a");
}

TEST_F(TargetsTest, TwoNamesNeverShareAFile) {
  Place place = Into();
  place.force = true;
  Targets targets(place);
  targets.Choose(L"LOG");
  ExpectRefusal(targets, L"LOG");
  ExpectRefusal(targets, L"log");
  ExpectRefusal(targets, L"log.part");  // LOG is downloaded under that name
  targets.Choose(L"x.part");
  ExpectRefusal(targets, L"X");
  targets.Choose(L"a/b");
  ExpectRefusal(targets, L"a%2Fb");
}

}  // namespace
}  // namespace cli
