#include "velmar/fields.h"

#include <cstdlib>

#include "platform/text.h"

using rcvlink::ToWide;

namespace VelmarCommands {

std::vector<std::wstring> SplitFields(std::string_view text) {
  std::vector<std::wstring> fields;
  bool quoted = false;
  size_t start = 0;
  for (size_t i = 0; i < text.size(); ++i) {
    if (text[i] == '"') quoted = !quoted;
    if (text[i] != ',' || quoted) continue;
    fields.push_back(ToWide(text.substr(start, i - start)));
    start = i + 1;
  }
  if (!quoted) fields.push_back(ToWide(text.substr(start)));
  return fields;
}

std::wstring WithoutQuotes(std::wstring_view field) {
  const size_t first = field.find_first_not_of(L'"');
  if (first == std::wstring_view::npos) return {};
  const size_t last = field.find_last_not_of(L'"');
  return std::wstring(field.substr(first, last - first + 1));
}

int ToInteger(const std::wstring& field) { return _wtoi(field.c_str()); }

}  // namespace VelmarCommands
