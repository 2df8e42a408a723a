#include "wildcard.h"

#include <string>

#include "names.h"

namespace cli {
namespace {

// After a mismatch the last * takes one character more; earlier ones need not change.
bool Fits(std::wstring_view name, std::wstring_view pattern) {
  size_t at = 0;
  size_t in_pattern = 0;
  size_t star = std::wstring_view::npos;
  size_t taken_by_star = 0;
  while (at < name.size()) {
    const bool ended = in_pattern == pattern.size();
    if (!ended && pattern[in_pattern] == L'*') {
      star = in_pattern++;
      taken_by_star = at;
    } else if (!ended && (pattern[in_pattern] == L'?' || pattern[in_pattern] == name[at])) {
      ++in_pattern;
      ++at;
    } else if (star != std::wstring_view::npos) {
      in_pattern = star + 1;
      at = ++taken_by_star;
    } else {
      return false;
    }
  }
  return pattern.find_first_not_of(L'*', in_pattern) == std::wstring_view::npos;
}

}  // namespace

bool IsPattern(std::wstring_view text) {
  return text.find_first_of(L"*?") != std::wstring_view::npos;
}

bool FitsPattern(std::wstring_view name, std::wstring_view pattern) {
  return Fits(Capitals(name), Capitals(pattern));
}

}  // namespace cli
