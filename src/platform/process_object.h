// A process-wide object that cannot be constant-initialised, as it has a lock or allocates.
#ifndef RCVLINK_PLATFORM_PROCESS_OBJECT_H_
#define RCVLINK_PLATFORM_PROCESS_OBJECT_H_

#include <optional>

// Lives at namespace scope, declared constinit, behind the function that gives it to the others.
//
// The first get() makes the object. DllMain makes that call at load, when no other thread can be in
// the library, so nothing guards it. A static local of a function would be guarded, and the
// runtime's guards keep a TLS slot and handles when the library is unloaded. The constructor of a
// plain object at namespace scope may not raise: that ends the process instead of the load.
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

#endif  // RCVLINK_PLATFORM_PROCESS_OBJECT_H_
