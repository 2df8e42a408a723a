// The texts of faults on the simulator's command line.
#include "simulator/fault_text.h"

#include "simulator/quorin/fault_text.h"
#include "simulator/usb/faults.h"
#include "simulator/velmar/fault_text.h"
#include "tests/fuzz/target.h"

namespace {

void Parse(uint8_t kind, const std::string& text) {
  const auto part = static_cast<uint8_t>(kind / 10 % 8);
  switch (kind % 10) {
    case 0:
      sim::ParseSizeLie(text);
      break;
    case 1:
      sim::ParseSeconds(text);
      break;
    case 2:
      sim::ParseBlockFault(static_cast<sim::BlockFaultKind>(part), text);
      break;
    case 3:
      sim::ParseReplyFault(static_cast<sim::ReplyFaultKind>(part % 7), text);
      break;
    case 4:
      sim::ParseChunkFault(static_cast<sim::VelmarChunkFaultKind>(part % 7), text);
      break;
    case 5:
      sim::ParseReplyFault(static_cast<sim::VelmarReplyFaultKind>(part), text);
      break;
    case 6:
      sim::ParseComponent(text);
      break;
    case 7:
      sim::ParseEndpoints(text);
      break;
    case 8:
      sim::ParseDescriptorRefusal(text);
      break;
    default:
      sim::ParseWriteError(text);
  }
}

}  // namespace

void fuzz::Target(std::span<const uint8_t> bytes) {
  Input input(bytes);
  const uint8_t kind = input.Byte();
  try {
    Parse(kind, input.Rest());
  } catch (const std::invalid_argument&) {
  }
}
