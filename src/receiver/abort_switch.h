// Lets another thread end the operation of a driver. An abort does three things: it sets a flag,
// which operations test between their steps; it marks the command that is being executed; and it
// cancels the connection, which ends the wait that is running or else the next one.
#ifndef RCVLINK_RECEIVER_ABORT_SWITCH_H_
#define RCVLINK_RECEIVER_ABORT_SWITCH_H_

#include <atomic>

#include "commands/receiver_cmd.h"
#include "platform/critical_section.h"
#include "transport/connection.h"

namespace rcvlink {

// Any thread may call these functions; none of them waits for the link.
class AbortSwitch {
 public:
  // The connection is not owned; without one (null) nothing can be aborted. Raises the HRESULT of
  // the Win32 error when its lock cannot be made.
  explicit AbortSwitch(CIConnection* connection) : connection_(connection) {}

  void Abort();

  // Tests and clears the flag, and with it a cancel that has not ended a wait: one abort ends one
  // operation.
  bool Take();

  // Tests the flag and does not clear it.
  bool IsSet() const;

  // Clears a cancel that has not ended a wait yet, so that it ends no wait of the next step. The
  // flag stays.
  void ClearCancel();

  // The command that Abort marks, for a scope: it must not be marked after it was destroyed.
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
  // Guards the two members below, and keeps the steps of an abort together: without it, Take could
  // clear the flag and leave the cancel for the next operation.
  CriticalSection lock_;
  std::atomic<bool> aborted_ = false;  // read without the lock, written under it
  CReceiverCmd* current_command_ = nullptr;
};

}  // namespace rcvlink

#endif  // RCVLINK_RECEIVER_ABORT_SWITCH_H_
