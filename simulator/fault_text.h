// The command-line form of faults, as far as all families share it. Functions that parse throw
// std::invalid_argument with a message for the user when the text does not fit.
#ifndef SIMULATOR_FAULT_TEXT_H_
#define SIMULATOR_FAULT_TEXT_H_

#include <charconv>
#include <cstdint>
#include <stdexcept>
#include <string>
#include <string_view>
#include <system_error>
#include <utility>

#include "simulator/faults.h"

namespace sim {

// "NAME=SIZE".
SizeLie ParseSizeLie(std::string_view text);

// "TIMES": a number above 0 or "always".
uint32_t ParseTimes(std::string_view text);

// Cuts "@TIMES" off the end of `text`; gives `otherwise` if it is not there.
uint32_t CutTimes(std::string_view& text, uint32_t otherwise);

// Seconds with or without a fraction, up to a day; gives milliseconds.
uint32_t ParseSeconds(std::string_view text);

// The two sides of the first `mark`; the second is empty when there is none.
std::pair<std::string_view, std::string_view> SplitAt(std::string_view text, char mark);

// The whole text as a number; `what` says what it should have been.
template <typename Number>
Number ParseNumber(std::string_view text, std::string_view what) {
  Number number{};
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, number);
  if (error != std::errc() || stop != end) {
    throw std::invalid_argument("'" + std::string(text) + "' is no " + std::string(what));
  }
  return number;
}

}  // namespace sim

#endif  // SIMULATOR_FAULT_TEXT_H_
