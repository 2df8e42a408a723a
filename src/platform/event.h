// The question that every layer asks of an event.
#ifndef RCVLINK_PLATFORM_EVENT_H_
#define RCVLINK_PLATFORM_EVENT_H_

#include "platform/win32.h"

// Whether the event is signalled, without waiting. A null event never is.
inline bool IsSignalled(HANDLE event) {
  return event != nullptr && WaitForSingleObject(event, 0) == WAIT_OBJECT_0;
}

#endif  // RCVLINK_PLATFORM_EVENT_H_
