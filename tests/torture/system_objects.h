// Windows' calls that make an event, a mutex or a text of the host's: one of them may fail. They replace the imports of
// the whole program; Linux code has none, so in the sanitized tests nothing fails.
#ifndef RCVLINK_TESTS_TORTURE_SYSTEM_OBJECTS_H_
#define RCVLINK_TESTS_TORTURE_SYSTEM_OBJECTS_H_

#include <cstddef>
#include <cstdint>

namespace torture {

// Counts those of the thread that made it, while this lives. One at a time.
class SystemObjects {
 public:
  static constexpr size_t kNone = SIZE_MAX;

  // The one of this number, from 0, fails. The others are made.
  explicit SystemObjects(size_t failing);
  SystemObjects(const SystemObjects&) = delete;
  SystemObjects& operator=(const SystemObjects&) = delete;
  ~SystemObjects();

  static bool HasFailed();
  static const char* Failed();  // the name of the call that failed
};

}  // namespace torture

#endif  // RCVLINK_TESTS_TORTURE_SYSTEM_OBJECTS_H_
