#include "receiver/abort_switch.h"

#include <mutex>

namespace rcvlink {

void AbortSwitch::Abort() {
  if (!connection_) return;
  const std::scoped_lock lock(lock_);
  aborted_ = true;
  if (current_command_) current_command_->Cancel();
  connection_->Cancel();
}

bool AbortSwitch::Take() {
  if (!aborted_) return false;  // nearly always: a download tests three times a block
  const std::scoped_lock lock(lock_);
  if (!aborted_.exchange(false)) return false;
  connection_->ClearCancel();
  return true;
}

bool AbortSwitch::IsSet() const { return aborted_; }

void AbortSwitch::ClearCancel() {
  const std::scoped_lock lock(lock_);
  if (connection_) connection_->ClearCancel();
}

void AbortSwitch::SetCurrentCommand(CReceiverCmd* command) {
  const std::scoped_lock lock(lock_);
  current_command_ = command;
}

}  // namespace rcvlink
