// The command-line form of a damaged line. Functions that parse throw std::invalid_argument with a
// message for the user when the text does not fit.
#ifndef SIMULATOR_DAMAGE_TEXT_H_
#define SIMULATOR_DAMAGE_TEXT_H_

#include <string_view>
#include <vector>

#include "simulator/damaged_line.h"

namespace sim {

// A chance from 0 to 1.
double ParseRate(std::string_view text);

// "KIND,...": the names of kinds.
std::vector<NoiseKind> ParseNoiseKinds(std::string_view text);

// "time=SECONDS", "byte=NUMBER" or "block=NUMBER", with ":SECONDS" after it for how long it lasts.
// Only an unplugging may be without, and is then for ever.
LineEvent ParseLineEvent(LineEventKind kind, std::string_view text);

}  // namespace sim

#endif  // SIMULATOR_DAMAGE_TEXT_H_
