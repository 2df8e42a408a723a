// What a Velmar receiver can be told to do wrong.
#ifndef SIMULATOR_VELMAR_FAULTS_H_
#define SIMULATOR_VELMAR_FAULTS_H_

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "simulator/faults.h"

namespace sim {

enum class VelmarChunkFaultKind {
  kDamagedCrc,
  kFlippedBit,  // The last bit of the data is wrong on the wire; the CRC is that of the right one.
  kForgedBit,   // The last bit of the data is wrong, and the CRC is that of the wrong data.
  kWrongSync,   // The first of the three sync bytes is right, the others are not; the CRC fits.
  kMessageLength,  // The header says `amount`, the body is unchanged; the CRC fits.
  kBodyLength,     // The body has `amount` bytes, cut off or filled up with 0; header and CRC fit.
  kHeaderLength,   // The header says that it has `amount` bytes; the CRC fits.
  kSilence,        // The chunk comes `amount` ms late.
};

// Happens to one chunk of a file, the first `times` times that it is sent.
struct VelmarChunkFault {
  VelmarChunkFaultKind kind = VelmarChunkFaultKind::kDamagedCrc;
  uint32_t chunk = 0;  // Chunks are counted from 0.
  uint32_t times = kOnce;
  uint32_t amount = 0;
};

enum class VelmarReplyFaultKind {
  kRefused,             // Answered with an error and not executed.
  kRefusedBare,         // The same with an error that has no text.
  kMute,                // As if the command had not been heard.
  kSilence,             // The reply comes `amount` ms late.
  kLatePrompt,          // `amount` ms pass between the acknowledgement and the prompt.
  kLateLog,             // `amount` ms pass between the prompt and the first log.
  kGarbageBefore,       // `amount` bytes that are no reply come first.
  kEndlessPrompt,       // The prompt begins, goes on for `amount` bytes and does not end.
  kLineEndAfterPrompt,  // CR LF follow the prompt.
  kAbbreviatedLog,      // An abbreviated log comes instead of what was asked for.
  kDamagedCrc,          // The CRC of every ASCII log is damaged.
  kOpenQuotes,          // The body of the last ASCII log ends within quotation marks.
  kFewerFields,         // The body of every ASCII log ends after `amount` fields.
  kCount,               // A body that begins with its number of entries says `amount`.
  kSequenceGap,         // A number is left out before the ASCII log `amount`, from 0.
  kSequenceOpen,        // The sequence numbers of the ASCII logs end at 1.
};

// The command of a fault that concerns every command.
inline constexpr std::string_view kAnyVelmarCommand = "*";

// Happens to the commands that begin with `command`, whatever its case. A fault in a log happens
// only to commands that are answered with such a log.
struct VelmarReplyFault {
  VelmarReplyFaultKind kind = VelmarReplyFaultKind::kRefused;
  std::string command = std::string(kAnyVelmarCommand);
  uint32_t times = kAlways;
  int64_t amount = 0;
};

struct VelmarFaults {
  std::vector<VelmarChunkFault> chunks = {};
  std::vector<VelmarReplyFault> replies = {};
  std::vector<SizeLie> sizes = {};
  // Commands that change the port are acknowledged and have no effect.
  bool keeps_speed = false;
  // The list of ports does not have the one that the host is on.
  bool hides_own_port = false;
  // The last chunk of a file says that another one follows.
  bool endless_sequence = false;
  // The receiver is gone once this chunk has left.
  std::optional<uint32_t> vanish_after_chunk = std::nullopt;
};

// The fault of one kind that is due for a chunk that is sent now. Counts one occurrence.
std::optional<VelmarChunkFault> TakeChunkFault(VelmarFaults& faults,
                                               VelmarChunkFaultKind kind,
                                               uint64_t chunk);

// The fault of one kind that is due for a command. Counts one occurrence.
std::optional<VelmarReplyFault> TakeReplyFault(VelmarFaults& faults,
                                               VelmarReplyFaultKind kind,
                                               std::string_view command);

// The size that the receiver gives for a file.
uint64_t ToldSize(const VelmarFaults& faults, std::string_view file, uint64_t size);

// The word for a fault in a transcript.
std::string_view FaultName(VelmarChunkFaultKind kind);

}  // namespace sim

#endif  // SIMULATOR_VELMAR_FAULTS_H_
