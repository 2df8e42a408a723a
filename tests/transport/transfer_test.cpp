// The record, the event and the bytes of a transfer, when it is used again.
#include "transport/transfer.h"

#include <gtest/gtest.h>

#include <memory>

using rcvlink::Transfer;

namespace {

bool IsSignalled(const Transfer& transfer) {
  return WaitForSingleObject(transfer.event(), 0) == WAIT_OBJECT_0;
}

TEST(Transfer, IsPreparedAgain) {
  std::unique_ptr<Transfer> transfer;
  ASSERT_EQ(Transfer::Create(/*manual_reset=*/TRUE, transfer), S_OK);
  EXPECT_EQ(transfer->Prepare(4), S_OK);
  EXPECT_EQ(transfer->record()->hEvent, transfer->event());
  const uint8_t* const bytes = transfer->bytes();

  SetEvent(transfer->event());
  transfer->record()->Internal = ERROR_GEN_FAILURE;
  EXPECT_EQ(transfer->Prepare(3), S_OK);
  EXPECT_FALSE(IsSignalled(*transfer));
  EXPECT_EQ(transfer->record()->Internal, 0u);
  EXPECT_EQ(transfer->record()->hEvent, transfer->event());
  EXPECT_EQ(transfer->bytes(), bytes);  // there is room already
}

}  // namespace
