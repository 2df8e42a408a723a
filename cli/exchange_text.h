// An exchange as lines for a person.
#ifndef RCVLINK_CLI_EXCHANGE_TEXT_H_
#define RCVLINK_CLI_EXCHANGE_TEXT_H_

#include <cstdint>
#include <string>

#include "exchange.h"

namespace cli {

// "host -> library": from whom to whom; empty for entries that are no message.
std::string PartiesOf(TraceKind kind);

// "+15 ms", "+2.5 s"; empty for no time.
std::string Gap(uint64_t ms);

// "5.0 s, 14 commands, 2 retries, 1 time-out, no failures"
std::string Summary(const Exchange& exchange);

// Every entry, the summary, and the result codes with their meaning.
// `verbose`: also the lines of the report themselves.
std::string ToText(const Exchange& exchange, bool verbose);

}  // namespace cli

#endif  // RCVLINK_CLI_EXCHANGE_TEXT_H_
