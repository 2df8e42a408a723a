// Lets one of Windows' calls fail that make an event, a mutex or a text. The imports of the whole
// program are replaced. Linux code has none, so there nothing fails.
#ifndef RCVLINK_TESTS_TORTURE_SYSTEM_OBJECTS_H_
#define RCVLINK_TESTS_TORTURE_SYSTEM_OBJECTS_H_

#include <cstddef>
#include <cstdint>

namespace torture {

// Counts the calls of the thread that made it, while this lives. One at a time.
class SystemObjects {
 public:
  static constexpr size_t kNone = SIZE_MAX;

  // The call of this number, from 0, fails.
  explicit SystemObjects(size_t failing);
  SystemObjects(const SystemObjects&) = delete;
  SystemObjects& operator=(const SystemObjects&) = delete;
  ~SystemObjects();

  static bool HasFailed();
  static const char* Failed();  // the name of the call that failed
};

}  // namespace torture

#endif  // RCVLINK_TESTS_TORTURE_SYSTEM_OBJECTS_H_
