// An exchange as a page for a browser.
#ifndef RCVLINK_CLI_EXCHANGE_PAGE_H_
#define RCVLINK_CLI_EXCHANGE_PAGE_H_

#include <cstddef>
#include <string>
#include <string_view>

#include "exchange.h"

namespace cli {

// How many entries a page shows at most; browsers are slow with more.
inline constexpr size_t kMostPageEntries = 20'000;

// Text as HTML shows it, in an attribute too.
std::string Escaped(std::string_view text);

// One page that needs nothing else: a time line, and every entry between host, library and
// receiver. It has no script, and allows none.
// `title`: printable UTF-8, such as the report's name.
std::string ToPage(const Exchange& exchange, const std::string& title);

}  // namespace cli

#endif  // RCVLINK_CLI_EXCHANGE_PAGE_H_
