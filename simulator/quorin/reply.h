// The frame of a Quorin reply.
#ifndef SIMULATOR_QUORIN_REPLY_H_
#define SIMULATOR_QUORIN_REPLY_H_

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "simulator/bytes.h"

namespace sim {

inline constexpr std::string_view kReplyOk = "RE";
inline constexpr std::string_view kReplyError = "ER";

// Frames a message: the identifier, three hexadecimal digits with the length of the body, the body
// and a line end that is not counted. The body begins with the tag. `length_error` is added to the
// length in the header.
Bytes FrameReply(std::string_view identifier,
                 const std::optional<std::string>& tag,
                 std::string_view text,
                 int32_t length_error = 0);

}  // namespace sim

#endif  // SIMULATOR_QUORIN_REPLY_H_
