// The public header as the library itself includes it: always after <windows.h>, so that file times
// have the same type in every source.
#ifndef RCVLINK_PLATFORM_API_TYPES_H_
#define RCVLINK_PLATFORM_API_TYPES_H_

#include "platform/win32.h"

// After <windows.h>.
#include "rcvlink.h"

#endif  // RCVLINK_PLATFORM_API_TYPES_H_
