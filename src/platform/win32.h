// <windows.h> as this library wants it: lean, without min and max, and without the macros that
// would rename operations of ours.
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
