// What the C++ runtime inside the DLL keeps for exceptions, given back at unload.
#ifndef RCVLINK_API_EXCEPTION_STATE_H_
#define RCVLINK_API_EXCEPTION_STATE_H_

// Frees it for all threads. The last that the library does at unload: nothing may be raised after.
void FreeExceptionState();

#endif  // RCVLINK_API_EXCEPTION_STATE_H_
