// A copy of some bytes with an unreadable page directly after them: reading beyond the end crashes
// the program.
#ifndef RCVLINK_TESTS_SUPPORT_GUARDED_BYTES_H_
#define RCVLINK_TESTS_SUPPORT_GUARDED_BYTES_H_

#include <algorithm>
#include <cstddef>
#include <string_view>

#include "platform/win32.h"

class GuardedBytes {
 public:
  explicit GuardedBytes(std::string_view bytes) : size_(bytes.size()) {
    const size_t readable = (bytes.size() / kPage + 1) * kPage;
    pages_ = static_cast<char*>(
        VirtualAlloc(nullptr, readable + kPage, MEM_RESERVE | MEM_COMMIT, PAGE_READWRITE));
    DWORD old = 0;
    VirtualProtect(pages_ + readable, kPage, PAGE_NOACCESS, &old);
    begin_ = pages_ + readable - size_;
    std::ranges::copy(bytes, begin_);
  }
  GuardedBytes(const GuardedBytes&) = delete;
  GuardedBytes& operator=(const GuardedBytes&) = delete;
  ~GuardedBytes() { VirtualFree(pages_, 0, MEM_RELEASE); }

  std::string_view View() const { return {begin_, size_}; }

 private:
  static constexpr size_t kPage = 4096;

  size_t size_;
  char* pages_ = nullptr;
  char* begin_ = nullptr;
};

#endif  // RCVLINK_TESTS_SUPPORT_GUARDED_BYTES_H_
