// How many handles this process has open.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_HANDLE_COUNT_H_
#define RCVLINK_TESTS_HOST_SUPPORT_HANDLE_COUNT_H_

#include <cstddef>

namespace host {

// Asks for each handle value: Wine does not count (GetProcessHandleCount gives 0 there).
size_t HandleCount();

}  // namespace host

#endif  // RCVLINK_TESTS_HOST_SUPPORT_HANDLE_COUNT_H_
