// The command-line form of the faults and components of a Velmar receiver. Functions that
// parse throw std::invalid_argument with a message for the user when the text does not fit.
#ifndef SIMULATOR_VELMAR_FAULT_TEXT_H_
#define SIMULATOR_VELMAR_FAULT_TEXT_H_

#include <string_view>

#include "simulator/fault_text.h"
#include "simulator/velmar/faults.h"
#include "simulator/velmar/version.h"

namespace sim {

bool HasAmount(VelmarChunkFaultKind kind);
bool HasAmount(VelmarReplyFaultKind kind);

// "CHUNK[@TIMES]", once by default; for the kinds with an amount "CHUNK:AMOUNT[@TIMES]". The
// amount is in seconds for kSilence and in bytes for the others.
VelmarChunkFault ParseChunkFault(VelmarChunkFaultKind kind, std::string_view text);

// "COMMAND[@TIMES]", always by default; for the kinds with an amount "AMOUNT[:COMMAND][@TIMES]".
// The amount is in seconds for whatever comes late.
VelmarReplyFault ParseReplyFault(VelmarReplyFaultKind kind, std::string_view text);

// "TYPE[:MODEL]".
VelmarComponent ParseComponent(std::string_view text);

}  // namespace sim

#endif  // SIMULATOR_VELMAR_FAULT_TEXT_H_
