// How another thread ends what a driver is doing. An abort has two halves: a flag, which operations
// look for between their steps, and the connection's cancel, which ends a wait that is running or
// the next one. The command that is being executed is marked as well.
#ifndef RCVLINK_RECEIVER_ABORT_SWITCH_H_
#define RCVLINK_RECEIVER_ABORT_SWITCH_H_

#include "commands/receiver_cmd.h"
#include "platform/critical_section.h"
#include "transport/connection.h"

// All operations may come from any thread; none waits for the link.
class AbortSwitch {
 public:
  // The connection is not owned; without one (null) nothing can be aborted. Raises the HRESULT of
  // the Win32 error when its lock cannot be made.
  explicit AbortSwitch(CIConnection* connection) : connection_(connection) {}

  void Abort();

  // Whether an abort came. Clears both its halves, so that one abort ends one operation.
  bool Take();

  // Whether an abort came that nobody has taken yet.
  bool IsSet();

  // Clears a cancel that has not ended a wait yet; the flag stays. What comes next is then not
  // disturbed by an abort that came before it.
  void ClearCancel();

  // Names the command that Abort marks, for a scope.
  class CurrentCommand {
   public:
    CurrentCommand(AbortSwitch& abort_switch, CReceiverCmd& command) : switch_(abort_switch) {
      switch_.SetCurrentCommand(&command);
    }
    CurrentCommand(const CurrentCommand&) = delete;
    CurrentCommand& operator=(const CurrentCommand&) = delete;
    ~CurrentCommand() { switch_.SetCurrentCommand(nullptr); }

   private:
    AbortSwitch& switch_;
  };

 private:
  void SetCurrentCommand(CReceiverCmd* command);

  CIConnection* connection_;
  CriticalSection lock_;  // guards the two below, and keeps the halves of an abort together
  bool aborted_ = false;
  CReceiverCmd* current_command_ = nullptr;
};

#endif  // RCVLINK_RECEIVER_ABORT_SWITCH_H_
