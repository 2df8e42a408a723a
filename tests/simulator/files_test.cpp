#include "simulator/files.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <chrono>
#include <filesystem>
#include <fstream>
#include <string>

#include "tests/simulator/session.h"

namespace sim {
namespace {

namespace fs = std::filesystem;

// A folder of its own for one test.
class FolderTest : public testing::Test {
 protected:
  void SetUp() override {
    const testing::TestInfo* info = testing::UnitTest::GetInstance()->current_test_info();
    folder_ = fs::path(testing::TempDir()) /
              (std::string("simulator_") + info->name() + "_" + std::to_string(getpid()));
    fs::remove_all(folder_);
    fs::create_directories(folder_ / "subfolder");
    Put("B.log", "second");
    Put("A.log", "first file");
  }
  void TearDown() override { fs::remove_all(folder_); }

  void Put(const std::string& name, const std::string& content) const {
    std::ofstream(folder_ / name, std::ios::binary) << content;
  }

  fs::path folder_;
};

TEST_F(FolderTest, ListsPlainFilesByName) {
  const FileStore store = FileStore::FromFolder(folder_);
  const auto list = store.List();
  ASSERT_EQ(list.size(), 2U);
  EXPECT_EQ(list[0].name, "A.log");
  EXPECT_EQ(list[0].size, 10U);
  EXPECT_EQ(list[1].name, "B.log");
}

TEST_F(FolderTest, HasTheTimeOfTheFile) {
  const auto time = std::chrono::sys_seconds(std::chrono::seconds(1'600'000'000));
  fs::last_write_time(folder_ / "A.log", std::chrono::file_clock::from_sys(time));
  EXPECT_EQ(FileStore::FromFolder(folder_).Find("A.log")->modified, 1'600'000'000);
}

TEST_F(FolderTest, ReadsFromDisk) {
  const FileStore store = FileStore::FromFolder(folder_);
  EXPECT_EQ(store.Read("A.log", 6, 4), ToBytes("file"));
  EXPECT_EQ(store.Read("A.log", 6, 5), std::nullopt);
  EXPECT_EQ(store.Read("A.log", 10, 0), Bytes());
  EXPECT_EQ(store.Read("C.log", 0, 0), std::nullopt);
}

TEST_F(FolderTest, IsASnapshot) {
  const FileStore store = FileStore::FromFolder(folder_);
  Put("C.log", "late");
  EXPECT_EQ(store.List().size(), 2U);
}

TEST_F(FolderTest, RemovingHidesAndDeletesNothing) {
  FileStore store = FileStore::FromFolder(folder_);
  EXPECT_TRUE(store.Remove("A.log"));
  EXPECT_FALSE(store.Remove("A.log"));
  EXPECT_FALSE(store.Find("A.log").has_value());
  EXPECT_TRUE(fs::exists(folder_ / "A.log"));
}

TEST_F(FolderTest, RenamingChangesTheNameThatIsServed) {
  FileStore store = FileStore::FromFolder(folder_);
  EXPECT_TRUE(store.Rename("A.log", "C.log"));
  EXPECT_FALSE(store.Find("A.log").has_value());
  EXPECT_EQ(store.Read("C.log", 6, 4), ToBytes("file"));
  EXPECT_TRUE(fs::exists(folder_ / "A.log"));
  EXPECT_FALSE(fs::exists(folder_ / "C.log"));
}

TEST_F(FolderTest, AFailedRenamingChangesNothing) {
  FileStore store = FileStore::FromFolder(folder_);
  EXPECT_FALSE(store.Rename("C.log", "D.log"));
  EXPECT_FALSE(store.Rename("A.log", "B.log"));
  EXPECT_EQ(store.Read("A.log", 6, 4), ToBytes("file"));
  EXPECT_EQ(store.Read("B.log", 0, 6), ToBytes("second"));
}

TEST_F(FolderTest, AFileThatShrankEndsItsTransfer) {
  Put("A0101.log", std::string(1100, 'x'));
  Session session({}, FileStore::FromFolder(folder_));
  EXPECT_EQ(SeenBlock(session.StartTransfer()).type, 0x02U);
  fs::resize_file(folder_ / "A0101.log", 600);
  EXPECT_EQ(SeenBlock(session.NextBlock(kAck)).type, 0x23U);
  EXPECT_EQ(session.Ask("%1%\r\n"), "RE003%1%\r\n");
}

TEST(FilesTest, AMissingFolderIsAnError) {
  EXPECT_THROW(FileStore::FromFolder("/no/such/folder"), fs::filesystem_error);
}

TEST(FilesTest, FilesInMemoryAreReadLikeOthers) {
  FileStore store;
  store.Add("x", ToBytes("0123456789"), 7);
  EXPECT_EQ(store.Find("x")->size, 10U);
  EXPECT_EQ(store.Find("x")->modified, 7);
  EXPECT_EQ(store.Read("x", 8, 2), ToBytes("89"));
  EXPECT_EQ(store.Read("x", 8, 3), std::nullopt);
  EXPECT_EQ(store.Read("x", 11, 0), std::nullopt);
}

}  // namespace
}  // namespace sim
