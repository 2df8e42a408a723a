// A directory for which there is no memory.
#include <gtest/gtest.h>

#include <cstdint>
#include <string_view>

#include "quorin/commands.h"
#include "tests/support/allocations.h"

namespace {

using namespace QuorinCommands;

class ListCommand : public CGetFileListCmd {
 public:
  using CGetFileListCmd::CGetFileListCmd;
  using CReceiverCmd::ReserveReply;
};

// Entries are kept in blocks, so most of them need no memory of their own.
TEST(QuorinFileListMemory, AnEntryThatCannotBeKeptEndsTheList) {
  constexpr std::string_view kEntry = "{a,1,0}";
  constexpr size_t kEnough = 100;
  ListCommand command(kTagged);
  command.ReserveReply(kEnough * kEntry.size());
  HRESULT result = S_OK;
  size_t kept = 0;
  for (; kept < kEnough && result == S_OK; ++kept) {
    bool done = false;
    const Allocations failing(0);
    result = command.ParseReply(
        kEntry.data(), static_cast<uint32_t>(kEntry.size()), ReplyKind::kReply, &done);
  }
  EXPECT_EQ(result, E_OUTOFMEMORY);
  EXPECT_EQ(command.Entries().size(), kept - 1);
}

}  // namespace
