// A process-wide object that cannot be initialised at compile time, since it has a lock or
// allocates.
#ifndef RCVLINK_PLATFORM_PROCESS_OBJECT_H_
#define RCVLINK_PLATFORM_PROCESS_OBJECT_H_

#include <optional>

namespace rcvlink {

// Declare it constinit at namespace scope of a source, with a function that gives the object.
//
// The first get() creates the object. DllMain makes that call at load, when no other thread can be
// in the library, so it needs no guard. A static local of a function would have one, and the
// runtime's guards keep a TLS slot and handles after the library is unloaded. A plain object at
// namespace scope would not do either: when its constructor raises, the process ends, and not only
// the load fails.
template <typename T>
class ProcessObject {
 public:
  constexpr ProcessObject() = default;

  T& get() {
    if (!object_) object_.emplace();
    return *object_;
  }

 private:
  std::optional<T> object_;
};

}  // namespace rcvlink

#endif  // RCVLINK_PLATFORM_PROCESS_OBJECT_H_
