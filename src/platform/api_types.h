// The chief header as the library itself sees it: always after <windows.h>, so that its records are
// the same in every source.
#ifndef RCVLINK_PLATFORM_API_TYPES_H_
#define RCVLINK_PLATFORM_API_TYPES_H_

#include "platform/win32.h"

// After it.
#include "rcvlink.h"

#endif  // RCVLINK_PLATFORM_API_TYPES_H_
