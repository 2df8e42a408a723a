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
  const std::scoped_lock lock(lock_);
  if (!aborted_) return false;
  aborted_ = false;
  connection_->ClearCancel();
  return true;
}

bool AbortSwitch::IsSet() {
  const std::scoped_lock lock(lock_);
  return aborted_;
}

void AbortSwitch::ClearCancel() {
  const std::scoped_lock lock(lock_);
  if (connection_) connection_->ClearCancel();
}

void AbortSwitch::SetCurrentCommand(CReceiverCmd* command) {
  const std::scoped_lock lock(lock_);
  current_command_ = command;
}

}  // namespace rcvlink
