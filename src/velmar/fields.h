// Comma-separated fields, as ASCII logs have them.
#ifndef RCVLINK_VELMAR_FIELDS_H_
#define RCVLINK_VELMAR_FIELDS_H_

#include <string>
#include <string_view>
#include <vector>

namespace VelmarCommands {

// Splits at the commas outside double quotes; quotes stay part of their field. The last field may
// be empty. When the text ends inside quotes the last field is left out: the rest of it has not
// come yet.
std::vector<std::wstring> SplitFields(std::string_view text);

// The text without double quotes at either end.
std::wstring WithoutQuotes(std::wstring_view field);

// As _wtoi: leading blanks, a sign, digits; 0 if there are none.
int ToInteger(const std::wstring& field);

}  // namespace VelmarCommands

#endif  // RCVLINK_VELMAR_FIELDS_H_
