// What a Quorin receiver can be told to do wrong.
#ifndef SIMULATOR_QUORIN_FAULTS_H_
#define SIMULATOR_QUORIN_FAULTS_H_

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "simulator/faults.h"

namespace sim {

enum class BlockFaultKind {
  kDamagedCrc,
  kUnchainedCrc,    // The CRC of the block for itself alone.
  kWrongSequence,   // The next block's number; the CRC fits.
  kWrongEnd,        // Another end byte.
  kLostByte,        // One byte of the payload is missing.
  kUnknownType,     // A type byte no host knows; the CRC fits.
  kNegativeLength,  // In the last block, whichever number that is.
  kEndBlock,        // A block of type '#': the receiver ends the transfer.
  kEndByte,         // '#' and nothing else: the receiver ends the transfer.
  kSilence,         // The block comes, but late; ACK and NAK before it are discarded.
};

// Happens the first `times` times that a block is sent: after kOnce it is right when it is sent
// again.
struct BlockFault {
  BlockFaultKind kind = BlockFaultKind::kDamagedCrc;
  uint32_t block = 0;  // Blocks are counted from 0.
  uint32_t times = kOnce;
  uint32_t silence_ms = 0;
};

enum class ReplyFaultKind {
  kRefused,         // Answered with ER and not executed.
  kMute,            // As if the command had not been heard.
  kSilence,         // The reply comes `amount` ms late.
  kGarbageBefore,   // `amount` bytes that are no message come first.
  kOtherTagBefore,  // A message that carries another tag comes first.
  kOtherTagOnly,    // The reply carries another tag.
  kWrongLength,     // The header's length is off by `amount`.
};

// The command of a fault that concerns every command that is answered.
inline constexpr std::string_view kAnyCommand = "*";
// The name of the empty line.
inline constexpr std::string_view kPingCommand = "ping";

// Happens to the commands that begin with `command`.
struct ReplyFault {
  ReplyFaultKind kind = ReplyFaultKind::kRefused;
  std::string command = std::string(kAnyCommand);
  uint32_t times = kAlways;
  int32_t amount = 0;
};

struct Faults {
  std::vector<BlockFault> blocks = {};
  std::vector<ReplyFault> replies = {};
  std::vector<SizeLie> sizes = {};
  // Commands that change the line speed have no effect: ER when tagged, nothing otherwise.
  bool keeps_speed = false;
  // File names in a listing are padded to more than 32 bytes.
  bool long_names = false;
  // The receiver is gone once the host has answered this block.
  std::optional<uint32_t> vanish_after_block = std::nullopt;
};

// The fault that is due for a block that is sent now, other than a silence. Counts one occurrence.
std::optional<BlockFaultKind> TakeBlockFault(Faults& faults, uint32_t block, bool last);

// How long the receiver is silent before it sends the block this time. Counts one occurrence.
uint32_t TakeBlockSilence(Faults& faults, uint32_t block);

// The fault of one kind that is due for a command. Counts one occurrence. `answered` says whether
// the command would be answered.
std::optional<ReplyFault> TakeReplyFault(Faults& faults,
                                         ReplyFaultKind kind,
                                         std::string_view command,
                                         bool answered);

// The word for a fault in a transcript.
std::string_view FaultName(BlockFaultKind kind);

}  // namespace sim

#endif  // SIMULATOR_QUORIN_FAULTS_H_
