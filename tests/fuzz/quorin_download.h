// A whole download from a Quorin receiver.
#ifndef RCVLINK_TESTS_FUZZ_QUORIN_DOWNLOAD_H_
#define RCVLINK_TESTS_FUZZ_QUORIN_DOWNLOAD_H_

#include "quorin/quorin_protocol.h"
#include "tests/fuzz/quorin_script.h"
#include "tests/support/manual_clock.h"
#include "tests/support/memory_stream.h"

namespace fuzz {

inline void Download(std::span<const uint8_t> bytes, EInstanceType link) {
  ManualClock clock;
  MemoryStream stream;
  auto owned = std::make_unique<ScriptedConnection>();
  owned->instance_type = link;
  if (link == eInstanceUSB) owned->speed = 0;
  if (link == eInstanceUSB) owned->speed_result = owned->set_speed_result = S_FALSE;
  const QuorinScript receiver(*owned, Input(bytes));
  CQuorinProtocol driver(std::move(owned));
  driver.DownloadFile(L"A.LOG", &stream, nullptr);
}

}  // namespace fuzz

#endif  // RCVLINK_TESTS_FUZZ_QUORIN_DOWNLOAD_H_
