// The content of a file that a test downloads.
#ifndef RCVLINK_TESTS_SUPPORT_CONTENT_H_
#define RCVLINK_TESTS_SUPPORT_CONTENT_H_

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <string>

// Bytes without two equal blocks.
inline std::string Content(size_t size) {
  std::string content(size, '\0');
  uint32_t state = 12345;
  std::ranges::generate(content, [&] {
    state = state * 1103515245U + 12345U;
    return static_cast<char>(state >> 16);
  });
  return content;
}

#endif  // RCVLINK_TESTS_SUPPORT_CONTENT_H_
