// Frees at unload what the C++ runtime inside the DLL keeps for exceptions.
#ifndef RCVLINK_API_EXCEPTION_STATE_H_
#define RCVLINK_API_EXCEPTION_STATE_H_

namespace rcvlink {

// Frees it for all threads. It is the last step of the unload: no exception may be raised after it.
void FreeExceptionState();

}  // namespace rcvlink

#endif  // RCVLINK_API_EXCEPTION_STATE_H_
