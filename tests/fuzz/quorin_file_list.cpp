// The directory of a Quorin receiver.
#include "quorin/quorin_protocol.h"
#include "tests/fuzz/quorin_script.h"

void fuzz::Target(std::span<const uint8_t> bytes) {
  auto owned = std::make_unique<ScriptedConnection>();
  const QuorinScript receiver(*owned, Input(bytes));
  CQuorinProtocol driver(std::move(owned));
  CFileList files;
  driver.GetFiles(&files);
  for (long i = 0; i < files.Count(); ++i) files.At(i);
}
