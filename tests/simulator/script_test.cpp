#include "simulator/program/script.h"

#include <gtest/gtest.h>

#include <filesystem>
#include <fstream>
#include <stdexcept>

#include "simulator/program/damage_options.h"
#include "simulator/program/quorin_program.h"

namespace sim {
namespace {

using Words = std::vector<std::string>;

class ScriptTest : public testing::Test {
 protected:
  ScriptTest() {
    AddScriptOption(command);
    AddQuorinOptions(command, quorin);
    AddDamageOptions(command, damage);
  }
  ~ScriptTest() override { std::filesystem::remove(path); }

  std::string ErrorOf(const std::string& json) const {
    try {
      ScriptWords(json, command);
    } catch (const std::invalid_argument& error) {
      return error.what();
    }
    return "no error";
  }

  std::string Write(const std::string& json) const {
    std::ofstream(path) << json;
    return path.string();
  }

  void Parse(Words words) {
    Words all = WithScript(words, app);
    app.parse(Words(all.rbegin(), all.rend()));
  }

  CLI::App app;
  CLI::App& command = *app.add_subcommand("quorin");
  QuorinOptions quorin;
  DamageOptions damage;
  const std::filesystem::path path =
      std::filesystem::temp_directory_path() /
      (std::string("rcvlink-script-") +
       testing::UnitTest::GetInstance()->current_test_info()->name() + ".json");
};

TEST_F(ScriptTest, AKeyIsASwitch) {
  EXPECT_EQ(ScriptWords(R"({"id": "QU7", "noise": 0.0001, "seed": 7, "echo": true})", command),
            (Words{"--id=QU7", "--noise=0.0001", "--seed=7", "--echo"}));
  EXPECT_EQ(ScriptWords("{}", command), Words{});
}

TEST_F(ScriptTest, FalseIsASwitchThatIsNotGiven) {
  EXPECT_EQ(ScriptWords(R"({"echo": false})", command), Words{});
}

TEST_F(ScriptTest, AnArrayGivesASwitchSeveralTimes) {
  EXPECT_EQ(ScriptWords(R"({"bad-crc": [3, "5@2"], "unplug": []})", command),
            (Words{"--bad-crc=3", "--bad-crc=5@2"}));
}

TEST_F(ScriptTest, AMistakeIsReportedWithItsKey) {
  EXPECT_EQ(ErrorOf(R"({"nois": 1})"), "nois: there is no such switch for a script");
  EXPECT_EQ(ErrorOf(R"({"": 1})"), ": there is no such switch for a script");
  for (const char* key : {"script", "help", "-noise", "noise "}) {
    EXPECT_NE(ErrorOf("{\"" + std::string(key) + "\": \"x\"}").find(key), std::string::npos) << key;
  }
  EXPECT_EQ(ErrorOf(R"({"echo": "yes"})"), "echo: \"yes\" is not true or false");
  EXPECT_EQ(ErrorOf(R"({"noise": true})"), "noise: true is no text and no number");
  EXPECT_EQ(ErrorOf(R"({"noise": null})"), "noise: null is no text and no number");
  EXPECT_EQ(ErrorOf(R"({"id": {"a": 1}})"), "id: {\"a\":1} is no text and no number");
  EXPECT_EQ(ErrorOf(R"({"bad-crc": [[1]]})"), "bad-crc: [1] is no text and no number");
}

TEST_F(ScriptTest, ANumberThatIsTooLargeIsReported) {
  EXPECT_NE(ErrorOf(R"({"delay": 5e6666})").find("5e6666"), std::string::npos);
}

TEST_F(ScriptTest, WhatIsNoObjectIsRefused) {
  EXPECT_EQ(ErrorOf("[1]"), "it is no JSON object");
  EXPECT_NE(ErrorOf("{\"id\":").find("line 1, column 7"), std::string::npos) << ErrorOf("{\"id\":");
}

TEST_F(ScriptTest, ItsSwitchesAreParsedAsThoseOfTheCommandLine) {
  Parse({"quorin", "--script", Write(R"({"noise": 1e-4, "seed": 18446744073709551615,
         "noise-kinds": "flip,drop", "unplug": ["block=3:1", "byte=9"], "bad-crc": 2})")});
  EXPECT_EQ(damage.rate, 0.0001);
  EXPECT_EQ(damage.seed, UINT64_MAX);
  EXPECT_EQ(damage.kinds.size(), 2U);
  EXPECT_EQ(damage.events.size(), 2U);
  ASSERT_EQ(quorin.faults.blocks.size(), 1U);
  EXPECT_EQ(quorin.faults.blocks[0].block, 2U);
}

TEST_F(ScriptTest, AWrongValueIsReportedWithItsSwitch) {
  const std::string file = Write(R"({"unplug": "block:3"})");
  try {
    Parse({"quorin", "--script", file});
    FAIL();
  } catch (const CLI::ParseError& error) {
    EXPECT_NE(std::string(error.what()).find("--unplug: 'block:3'"), std::string::npos)
        << error.what();
  }
}

TEST_F(ScriptTest, TheCommandLineReplacesASwitchOfTheScript) {
  const std::string file = Write(R"({"seed": 7, "id": "QU7", "unplug": ["block=1", "block=2"]})");
  Parse({"quorin", "--seed", "8", "--script=" + file, "--unplug=byte=4"});
  EXPECT_EQ(damage.seed, 8U);
  EXPECT_EQ(quorin.identity.id, "QU7");
  ASSERT_EQ(damage.events.size(), 1U);
  EXPECT_EQ(damage.events[0].start, LineEventStart::kByte);
}

TEST_F(ScriptTest, AFileThatCannotBeReadIsNamed) {
  try {
    WithScript({"quorin", "--script", path.string()}, app);
    FAIL();
  } catch (const std::invalid_argument& error) {
    EXPECT_EQ(std::string(error.what()), "script " + path.string() + ": cannot be read");
  }
}

}  // namespace
}  // namespace sim
