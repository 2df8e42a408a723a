// The host of tests/package, built from an installed tree with either compiler.
#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <cstdio>
#include <string>

#include "tests/host/support/program.h"
#include "tests/host/support/receiver.h"
#include "tests/host/support/simulated_port.h"
#include "tests/support/content.h"

using testing::HasSubstr;

namespace {

constexpr size_t kSize = 3000;

std::string OutputOf(const std::string& program) {
  const bed::SimulatedPort port({"quorin", "--id", "QU7", "--model", "QR9"},
                                {{"a.jps", Content(kSize)}});
  const auto result = bed::Program(program, {host::Narrow(port.name()), "a.jps"}).Finish();
  EXPECT_EQ(result.status, 0);
  EXPECT_EQ(result.errors, "");
  return result.output;
}

// Adler-32, in eight digits.
std::string SumOf(const std::string& bytes) {
  constexpr uint32_t kModulus = 65521;
  uint32_t low = 1;
  uint32_t high = 0;
  for (const char byte : bytes) {
    low = (low + static_cast<unsigned char>(byte)) % kModulus;
    high = (high + low) % kModulus;
  }
  char text[9];
  std::snprintf(text, sizeof(text), "%08X", static_cast<unsigned>(high << 16 | low));
  return text;
}

TEST(InstalledPackage, ServesBothCompilersAlike) {
  const std::string output = OutputOf("package_mingw.exe");
  EXPECT_EQ(OutputOf("package_msvc.exe"), output);
  EXPECT_THAT(output, testing::Not(HasSubstr("0x800705B4")));
  EXPECT_THAT(output, HasSubstr("SearchReceiver 0x00000000\n"));
  EXPECT_THAT(output, HasSubstr("QR9 QU7\n"));
  EXPECT_THAT(output, HasSubstr("1 files, a.jps 3000 bytes of "));
  EXPECT_THAT(
      output,
      HasSubstr("DownloadFile 0x00000000\nbytes 3000 sum " + SumOf(Content(kSize)) + "\n100 %\n"));
  EXPECT_THAT(output,
              HasSubstr("UploadFile 0x80004001\nRenameFile 0x80004001\n"
                        "DeleteFileW 0x00000000\nDCSetRcvBaudrate 0x00000000\n"));
  EXPECT_THAT(output,
              HasSubstr("UnlockConnection 0x00000000\nAbort 0x00000000\n"
                        "CheckConnection 0x00000000\nanswer 2\n"));
  EXPECT_THAT(output, testing::EndsWith("DestroyReceiver 0x00000000\n"));
}

TEST(InstalledPackage, ServesHostsOfTheHeaderForCpp20) {
  EXPECT_EQ(OutputOf("package_hpp.exe"), "QR9 QU7 3000\n");
}

}  // namespace
