// The receiver's end of a scripted connection: it removes the tag from each command and answers
// with messages that carry this tag.
#ifndef RCVLINK_TESTS_QUORIN_QUORIN_RESPONDER_H_
#define RCVLINK_TESTS_QUORIN_QUORIN_RESPONDER_H_

#include <algorithm>
#include <cctype>
#include <cstdio>
#include <functional>
#include <map>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "tests/support/scripted_connection.h"

// A message as it is on the wire.
inline std::string Message(std::string_view identifier, std::string_view body) {
  char digits[16] = {};
  std::snprintf(digits, sizeof(digits), "%03X", static_cast<unsigned>(body.size()));
  return std::string(identifier) + digits + std::string(body);
}

// Whether these bytes are a number between two percent signs.
inline bool IsTag(std::string_view bytes) {
  return bytes.size() > 2 && bytes.front() == '%' && bytes.back() == '%' &&
         std::ranges::all_of(bytes.substr(1, bytes.size() - 2),
                             [](unsigned char c) { return std::isdigit(c) != 0; });
}

class QuorinResponder {
 public:
  explicit QuorinResponder(ScriptedConnection& connection) : connection_(connection) {
    connection.on_write = [this](std::string_view bytes) { return Hear(std::string(bytes)); };
  }
  QuorinResponder(const QuorinResponder&) = delete;
  QuorinResponder& operator=(const QuorinResponder&) = delete;

  // Sends one message each time it receives the command (without a tag).
  void Reply(const std::string& command,
             const std::string& body,
             const std::string& identifier = "RE") {
    On(command, [=, this](const std::string& tag) {
      connection_.GiveRead(Message(identifier, tag + body));
    });
  }
  void On(const std::string& command, std::function<void(const std::string& tag)> act) {
    answers_[command] = std::move(act);
  }
  // The write of the command returns this, and nothing is sent.
  void FailWriteOf(const std::string& command, HRESULT result) { failures_[command] = result; }

  // Runs before a command is answered.
  std::function<void(const std::string& command)> on_hear;

 private:
  HRESULT Hear(const std::string& bytes) {
    if (IsTag(bytes)) {
      next_tag_ = bytes;
      return S_OK;
    }
    const std::string tag = std::exchange(next_tag_, {});
    if (on_hear) on_hear(bytes);
    if (const auto failure = failures_.find(bytes); failure != failures_.end()) {
      return failure->second;
    }
    if (const auto answer = answers_.find(bytes); answer != answers_.end()) answer->second(tag);
    return S_OK;
  }

  ScriptedConnection& connection_;
  std::map<std::string, std::function<void(const std::string&)>> answers_;
  std::map<std::string, HRESULT> failures_;
  std::string next_tag_;
};

// What the host sent: each command with "%%" in place of its tag, each control byte, and each
// change of speed as "speed <rate>".
inline std::vector<std::string> Conversation(const std::vector<std::string>& calls) {
  constexpr std::string_view kWrite = "write ";
  std::vector<std::string> conversation;
  std::string tag;
  for (const std::string& call : calls) {
    if (call.starts_with("speed ")) conversation.push_back(call);
    if (!call.starts_with(kWrite)) continue;
    const std::string bytes = call.substr(kWrite.size());
    if (IsTag(bytes)) {
      tag = "%%";
    } else {
      conversation.push_back(std::exchange(tag, {}) + bytes);
    }
  }
  return conversation;
}

#endif  // RCVLINK_TESTS_QUORIN_QUORIN_RESPONDER_H_
