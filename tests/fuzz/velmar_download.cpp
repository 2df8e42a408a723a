// A whole download from a Velmar receiver.
#include "tests/fuzz/velmar_script.h"
#include "tests/support/manual_clock.h"
#include "tests/support/memory_stream.h"
#include "velmar/velmar_protocol.h"

void fuzz::Target(std::span<const uint8_t> bytes) {
  ManualClock clock;
  MemoryStream stream;
  auto owned = std::make_unique<ScriptedConnection>();
  const VelmarScript receiver(*owned, Input(bytes));
  CVelmarProtocol driver(std::move(owned));
  driver.DownloadFile(L"A.LOG", &stream, nullptr);
}
