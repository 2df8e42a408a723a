// The command-line form of the faults of a Quorin receiver. Functions that parse throw
// std::invalid_argument with a message for the user when the text does not fit.
#ifndef SIMULATOR_QUORIN_FAULT_TEXT_H_
#define SIMULATOR_QUORIN_FAULT_TEXT_H_

#include <string_view>

#include "simulator/fault_text.h"
#include "simulator/quorin/faults.h"

namespace sim {

// "BLOCK[@TIMES]", once by default; for kSilence "BLOCK:SECONDS[@TIMES]".
BlockFault ParseBlockFault(BlockFaultKind kind, std::string_view text);

// "COMMAND[@TIMES]", always by default; for the kinds with an amount "AMOUNT[:COMMAND][@TIMES]".
// The amount is in seconds for kSilence and in bytes for the others.
ReplyFault ParseReplyFault(ReplyFaultKind kind, std::string_view text);

}  // namespace sim

#endif  // SIMULATOR_QUORIN_FAULT_TEXT_H_
