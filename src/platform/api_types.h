// The chief header as the library itself sees it: always behind <windows.h>, so that its records
// are the same in every source.
#ifndef RCVLINK_PLATFORM_API_TYPES_H_
#define RCVLINK_PLATFORM_API_TYPES_H_

#include "platform/win32.h"

// Behind it.
#include "api/rcvlink.h"

#endif  // RCVLINK_PLATFORM_API_TYPES_H_
