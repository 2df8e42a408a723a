// A test of an event that does not wait.
#ifndef RCVLINK_PLATFORM_EVENT_H_
#define RCVLINK_PLATFORM_EVENT_H_

#include "platform/win32.h"

namespace rcvlink {

// Whether the event is signalled; a null event never is. The test clears an auto-reset event.
inline bool IsSignalled(HANDLE event) {
  return event != nullptr && WaitForSingleObject(event, 0) == WAIT_OBJECT_0;
}

}  // namespace rcvlink

#endif  // RCVLINK_PLATFORM_EVENT_H_
