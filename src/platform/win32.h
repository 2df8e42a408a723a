// <windows.h> without what would disturb the library: the macros min and max, which replace
// std::min and std::max, and those that would rename member functions (DeleteFile to DeleteFileW).
#ifndef RCVLINK_PLATFORM_WIN32_H_
#define RCVLINK_PLATFORM_WIN32_H_

#ifndef WIN32_LEAN_AND_MEAN
#define WIN32_LEAN_AND_MEAN
#endif
#ifndef NOMINMAX
#define NOMINMAX
#endif
#include <windows.h>

#undef CreateFile
#undef DeleteFile

#endif  // RCVLINK_PLATFORM_WIN32_H_
