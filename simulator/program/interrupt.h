// The end of a program that is interrupted (Windows).
#ifndef SIMULATOR_PROGRAM_INTERRUPT_H_
#define SIMULATOR_PROGRAM_INTERRUPT_H_

#include <windows.h>

namespace sim {

// Lives as long as the program: the system and a thread may set it at any time.
HANDLE StopEvent();

}  // namespace sim

#endif  // SIMULATOR_PROGRAM_INTERRUPT_H_
