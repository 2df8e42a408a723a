#include "port_memory.h"

#include <windows.h>

#include <gtest/gtest.h>

#include <thread>
#include <vector>

#include "handle.h"
#include "temporary_folder.h"

namespace cli {
namespace {

constexpr KnownSetting kSetting{{57600, RtsMode::kHandshake}, eProtocolVelmar};
constexpr KnownSetting kOther{{9600, RtsMode::kOff}, eProtocolQuorin};

class PortMemoryTest : public testing::Test {
 protected:
  TemporaryFolder folder_;
  const std::filesystem::path file_ = folder_.path() / L"ports.json";
  const PortMemory memory_{file_};
};

TEST_F(PortMemoryTest, KeepsTheSettingOfEachPort) {
  EXPECT_EQ(memory_.Recall(L"COM7"), std::nullopt);
  EXPECT_TRUE(memory_.Remember(L"COM7", kSetting));
  EXPECT_TRUE(memory_.Remember(L"COM8", kOther));
  EXPECT_EQ(PortMemory(file_).Recall(L"COM7"), kSetting);
  EXPECT_EQ(PortMemory(file_).Recall(L"COM8"), kOther);
  EXPECT_TRUE(memory_.Remember(L"COM7", kOther));
  EXPECT_EQ(memory_.Recall(L"COM7"), kOther);
}

TEST_F(PortMemoryTest, TheLetterCaseOfAPortDoesNotCount) {
  EXPECT_TRUE(memory_.Remember(L"com7", kSetting));
  EXPECT_EQ(memory_.Recall(L"COM7"), kSetting);
}

TEST_F(PortMemoryTest, ForgetsOnePort) {
  EXPECT_TRUE(memory_.Forget(L"COM7"));
  EXPECT_FALSE(folder_.Has(L"ports.json"));
  EXPECT_TRUE(memory_.Remember(L"COM7", kSetting));
  EXPECT_TRUE(memory_.Remember(L"COM8", kOther));
  EXPECT_TRUE(memory_.Forget(L"com7"));
  EXPECT_EQ(memory_.Recall(L"COM7"), std::nullopt);
  EXPECT_EQ(memory_.Recall(L"COM8"), kOther);
}

TEST_F(PortMemoryTest, MakesItsFolder) {
  const PortMemory deep(folder_.path() / L"a" / L"b" / L"ports.json");
  EXPECT_TRUE(deep.Remember(L"COM7", kSetting));
  EXPECT_EQ(deep.Recall(L"COM7"), kSetting);
}

TEST_F(PortMemoryTest, WithoutAFileNothingIsRemembered) {
  const PortMemory none{{}};
  EXPECT_TRUE(none.Remember(L"COM7", kSetting));
  EXPECT_TRUE(none.Forget(L"COM7"));
  EXPECT_EQ(none.Recall(L"COM7"), std::nullopt);
}

TEST_F(PortMemoryTest, ADamagedFileIsAnEmptyOneAndReplaced) {
  for (const char* const text : {"",
                                 "{\"ports\": {\"COM7\": {\"speed\": 57",
                                 "\xFF\xFE\x01",
                                 "[]",
                                 "7",
                                 "{\"ports\": []}",
                                 "{\"ports\": {\"COM7\": 3}}",
                                 "{\"ports\": {\"COM7\": {\"speed\": \"57600\"}}}"}) {
    folder_.Write(L"ports.json", text);
    EXPECT_EQ(memory_.Recall(L"COM7"), std::nullopt) << text;
    EXPECT_TRUE(memory_.Remember(L"COM7", kSetting)) << text;
    EXPECT_EQ(memory_.Recall(L"COM7"), kSetting) << text;
  }
}

TEST_F(PortMemoryTest, AFileThatIsMuchTooLongIsAnEmptyOne) {
  constexpr size_t kMebibyte = 1 << 20;
  std::string text = R"({"ports": {"COM7": {"speed": 57600, "rts": "on", "protocol": "velmar"}}})";
  folder_.Write(L"ports.json", text);
  EXPECT_NE(memory_.Recall(L"COM7"), std::nullopt);
  folder_.Write(L"ports.json", text.append(kMebibyte, ' '));
  EXPECT_EQ(memory_.Recall(L"COM7"), std::nullopt);
}

TEST_F(PortMemoryTest, InvalidEntriesAreIgnored) {
  const auto entry = [](const char* speed, const char* rts, const char* protocol) {
    return std::string(R"({"ports": {"COM7": {"speed": )") + speed + R"(, "rts": ")" + rts +
           R"(", "protocol": ")" + protocol + R"("}}})";
  };
  folder_.Write(L"ports.json", entry("57600", "handshake", "velmar"));
  EXPECT_EQ(memory_.Recall(L"COM7"), kSetting);
  for (const std::string& text : {entry("0", "on", "velmar"),
                                  entry("-57600", "on", "velmar"),
                                  entry("57600.5", "on", "velmar"),
                                  entry("99999999999", "on", "velmar"),
                                  entry("57600", "up", "velmar"),
                                  entry("57600", "on", "any")}) {
    folder_.Write(L"ports.json", text);
    EXPECT_EQ(memory_.Recall(L"COM7"), std::nullopt) << text;
  }
}

// Keeps a file open, so that it cannot be replaced.
class HeldFile {
 public:
  HeldFile(const std::filesystem::path& file, DWORD share)
      : handle_(
            CreateFileW(file.c_str(), GENERIC_READ, share, nullptr, OPEN_EXISTING, 0, nullptr)) {
    EXPECT_NE(handle_.get(), INVALID_HANDLE_VALUE);
  }

 private:
  UniqueHandle handle_;
};

TEST_F(PortMemoryTest, AFileThatCannotBeWrittenIsReported) {
  folder_.Write(L"folder", "");
  const PortMemory nowhere(folder_.path() / L"folder" / L"ports.json");
  EXPECT_FALSE(nowhere.Remember(L"COM7", kSetting));
  EXPECT_EQ(nowhere.Recall(L"COM7"), std::nullopt);

  EXPECT_TRUE(memory_.Remember(L"COM7", kSetting));
  {
    const HeldFile held(file_, 0);
    EXPECT_FALSE(memory_.Remember(L"COM7", kOther));
    EXPECT_EQ(memory_.Recall(L"COM7"), std::nullopt);
  }
  EXPECT_EQ(memory_.Recall(L"COM7"), kSetting);
  EXPECT_FALSE(folder_.Has(L"ports.json.new"));
}

TEST_F(PortMemoryTest, WritesOnlyWhatIsNew) {
  EXPECT_TRUE(memory_.Remember(L"COM7", kSetting));
  const HeldFile held(file_, FILE_SHARE_READ);
  EXPECT_TRUE(memory_.Remember(L"COM7", kSetting));
  EXPECT_FALSE(memory_.Remember(L"COM7", kOther));
  EXPECT_TRUE(memory_.Forget(L"COM8"));
  EXPECT_FALSE(memory_.Forget(L"COM7"));
}

TEST_F(PortMemoryTest, ProgramsThatRunAtTheSameTimeLoseNothing) {
  constexpr int kPrograms = 8;
  constexpr int kTimes = 20;
  std::vector<std::jthread> programs;
  for (int i = 0; i < kPrograms; ++i) {
    programs.emplace_back([this, i] {
      const std::wstring port = L"COM" + std::to_wstring(i);
      for (int j = 0; j < kTimes; ++j) {
        EXPECT_TRUE(PortMemory(file_).Remember(port, j % 2 == 0 ? kSetting : kOther));
      }
    });
  }
  programs.clear();
  for (int i = 0; i < kPrograms; ++i) {
    EXPECT_EQ(memory_.Recall(L"COM" + std::to_wstring(i)), kOther) << i;
  }
}

// It was killed while it held the lock.
TEST_F(PortMemoryTest, AProgramThatWasKilledDoesNotBlockOthers) {
  const UniqueHandle mutex(CreateMutexW(nullptr, FALSE, L"Local\\rcvlink-cli port memory"));
  std::jthread([&mutex] { WaitForSingleObject(mutex.get(), INFINITE); }).join();
  EXPECT_TRUE(memory_.Remember(L"COM7", kSetting));
  EXPECT_EQ(memory_.Recall(L"COM7"), kSetting);
}

TEST_F(PortMemoryTest, TheUsualFileIsTheUsers) {
  const std::filesystem::path file = PortMemory::UsualFile();
  EXPECT_TRUE(file.is_absolute());
  EXPECT_EQ(file.filename(), L"ports.json");
}

}  // namespace
}  // namespace cli
