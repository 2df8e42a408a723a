// The tags of Quorin commands: they are counted per process, from 1.
#include "tests/cli_run/cli.h"
#include "tests/host/support/simulated_usb.h"
#include "tests/host/support/wire.h"

namespace cli_run {
namespace {

using testing::ElementsAre;

TEST_F(Cli, TheFirstTagOfAProcessIsOne) {
  const bed::SimulatedPort receiver({"quorin"});
  EXPECT_EQ(RunOn(receiver, {"check"}).status, kDone);
  const std::string transcript = receiver.Transcript();
  EXPECT_NE(transcript.find("\n> %1%\\r\\n\n"), std::string::npos) << transcript;
  const std::vector<int> tags = host::TagsOf(transcript);
  ASSERT_GE(tags.size(), 2u);
  for (size_t i = 0; i < tags.size(); ++i) EXPECT_EQ(tags[i], static_cast<int>(i) + 1);
}

// Identity and model come after the handshake.
TEST_F(Cli, EachProcessCountsItsTagsFromOne) {
  const bed::SimulatedPort receiver({"quorin"});
  EXPECT_EQ(RunOn(receiver, {"info"}).status, kDone);
  EXPECT_EQ(RunOn(receiver, {"info"}).status, kDone);
  EXPECT_THAT(host::TagsOf(receiver.Transcript()), ElementsAre(1, 2, 3, 4, 1, 2, 3, 4));
}

TEST_F(Cli, TheFirstTagIsOneOnUsbToo) {
  const bed::SimulatedUsb usb({"quorin"});
  const std::wstring device = usb.device();
  EXPECT_EQ(Run({"info", std::string(device.begin(), device.end()), "--link", "usb"}).status,
            kDone);
  EXPECT_THAT(host::TagsOf(usb.Transcript()), ElementsAre(1, 2, 3, 4));
}

}  // namespace
}  // namespace cli_run
