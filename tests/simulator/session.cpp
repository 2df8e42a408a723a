#include "tests/simulator/session.h"

#include <utility>

namespace sim {

Bytes TestPayload(size_t size) {
  Bytes bytes(size);
  for (size_t i = 0; i < size; ++i) {
    bytes[i] = static_cast<uint8_t>(i * 7 + 3);
  }
  return bytes;
}

FileStore OneFile(size_t size) {
  FileStore files;
  files.Add("A0101.log", TestPayload(size), 1'700'000'000);
  return files;
}

Session::Session(const QuorinOptions& options, FileStore files)
    : receiver(options, std::move(files), &transcript) {}

std::string Session::Ask(std::string_view text, uint64_t quiet_ms) {
  Say(text);
  std::string all;
  for (Bytes some = port.Read(SIZE_MAX, quiet_ms); !some.empty();
       some = port.Read(SIZE_MAX, quiet_ms)) {
    all += ToText(some);
  }
  return all;
}

Bytes Session::StartTransfer() {
  Ask("%1%get,\"A0101.log\":{500,512}\r\n");
  return NextBlock(kNak);
}

Bytes Session::NextBlock(std::string_view control, uint64_t wait_ms) {
  Say(control);
  return port.ReadFull(kBlockSize, wait_ms);
}

SeenBlock::SeenBlock(const Bytes& wire) {
  if (wire.size() == kBlockSize) {
    type = wire[0];
    field = wire[1] + wire[2] * 256U;
    crc = wire[515] + wire[516] * 256U;
    end = wire[517];
  }
}

}  // namespace sim
