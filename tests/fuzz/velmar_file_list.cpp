// The directory of a Velmar receiver.
#include "tests/fuzz/velmar_script.h"
#include "tests/support/manual_clock.h"
#include "velmar/velmar_protocol.h"

void fuzz::Target(std::span<const uint8_t> bytes) {
  ManualClock clock;
  auto owned = std::make_unique<ScriptedConnection>();
  const VelmarScript receiver(*owned, Input(bytes));
  CVelmarProtocol driver(std::move(owned));
  CFileList files;
  driver.GetFiles(&files);
  for (long i = 0; i < files.Count(); ++i) files.At(i);
}
