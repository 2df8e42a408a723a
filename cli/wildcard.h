// Patterns of file names.
#ifndef RCVLINK_CLI_WILDCARD_H_
#define RCVLINK_CLI_WILDCARD_H_

#include <string_view>

namespace cli {

// Whether a text has * or ? in it, which no name of a file of Windows has.
bool IsPattern(std::wstring_view text);

// Whether a name fits a pattern, in which * stands for any characters, also none, and ? for one. As
// in names of files the letter case does not count.
bool FitsPattern(std::wstring_view name, std::wstring_view pattern);

}  // namespace cli

#endif  // RCVLINK_CLI_WILDCARD_H_
