// How Quorin replies are framed. A message is a header of five bytes and a body:
//
//   "RE" "00D" "%7%/dev/ser/a"
//    |    |     +- body
//    |    +------- the body's length, three characters of hexadecimal
//    +------------ "RE" reply, "ER" error, two blanks for neither
#ifndef RCVLINK_QUORIN_REPLY_FRAMING_H_
#define RCVLINK_QUORIN_REPLY_FRAMING_H_

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

namespace QuorinCommands {

enum class ReplyKind : uint32_t { kBlank = 0, kReply = 1, kError = 2, kNone = 3 };

constexpr size_t kReplyHeaderLength = 5;

struct ReplyHeader {
  size_t position;  // of its first byte
  ReplyKind kind;
  size_t body_length;

  size_t MessageLength() const { return kReplyHeaderLength + body_length; }
};

// Finds the first header at or after `scan_from`, and moves `scan_from` past bytes that begin no
// header. A header whose five bytes have not all come stays, and is found when more has come.
std::optional<ReplyHeader> FindReplyHeader(std::string_view bytes, size_t& scan_from);

}  // namespace QuorinCommands

#endif  // RCVLINK_QUORIN_REPLY_FRAMING_H_
