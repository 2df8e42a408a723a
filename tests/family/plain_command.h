// The only exchange of a Plain receiver: a line of the host, then the receiver's answer, which ends
// with a line of a single dot.
#ifndef RCVLINK_TESTS_FAMILY_PLAIN_COMMAND_H_
#define RCVLINK_TESTS_FAMILY_PLAIN_COMMAND_H_

#include <string>
#include <string_view>

#include "commands/receiver_cmd.h"

class CPlainCommand : public CReceiverCmd {
 public:
  explicit CPlainCommand(const std::string& line);

  HRESULT Execute(CIConnection* connection, HANDLE abort_event) override;

  // The answer of the receiver, without the dot.
  std::string_view Answer() const;
};

#endif  // RCVLINK_TESTS_FAMILY_PLAIN_COMMAND_H_
