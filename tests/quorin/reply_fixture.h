// A command whose reply a test makes, read by read.
#ifndef RCVLINK_TESTS_QUORIN_REPLY_FIXTURE_H_
#define RCVLINK_TESTS_QUORIN_REPLY_FIXTURE_H_

#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <string>
#include <vector>

#include "quorin/quorin_command.h"
#include "tests/quorin/quorin_responder.h"
#include "tests/support/scripted_connection.h"

class AskCommand : public QuorinCommands::CQuorinCommand {
 public:
  explicit AskCommand(uint32_t flags) : CQuorinCommand("ask\r\n", flags) {}
  using CQuorinCommand::ReplyText;
};

class QuorinReplyTest : public testing::Test {
 protected:
  // What the receiver sends after the command; each string is one read. "%" stands for the tag.
  void Answer(std::vector<std::string> reads) {
    receiver.On("ask\r\n", [this, reads](const std::string&) {
      for (const std::string& read : reads) connection.GiveRead(read);
    });
  }
  void AnswerWithTag(std::function<std::vector<std::string>(const std::string& tag)> reads) {
    receiver.On("ask\r\n", [this, reads](const std::string& tag) {
      for (const std::string& read : reads(tag)) connection.GiveRead(read);
    });
  }
  size_t Reads() const {
    return static_cast<size_t>(std::ranges::count_if(
        connection.calls, [](const std::string& call) { return call.starts_with("read "); }));
  }

  ScriptedConnection connection;
  QuorinResponder receiver{connection};
};

#endif  // RCVLINK_TESTS_QUORIN_REPLY_FIXTURE_H_
