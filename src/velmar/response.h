// The beginning of a Velmar receiver's reply: an acknowledgement, the prompt of the port, then the
// log that was asked for, if any.
//
//   "\r\n<OK\r\n" "[COM1]" "#VERSIONA,COM1,0,..."
//   "\r\n<ERROR:" "[COM1]"
#ifndef RCVLINK_VELMAR_RESPONSE_H_
#define RCVLINK_VELMAR_RESPONSE_H_

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace VelmarCommands {

enum ResponseType : int32_t {
  RESPONSE_OK = 0,          // acknowledged
  RESPONSE_DATA = 1,        // the expected data is complete
  RESPONSE_ERROR = 2,       // refused, or data that contradicts itself
  RESPONSE_INCOMPLETE = 3,  // more bytes are needed
  RESPONSE_UNKNOWN = 4
};

// The beginning of a refusal.
inline constexpr std::string_view kRefusal = "\r\n<ERROR:";

struct Response {
  ResponseType type = RESPONSE_UNKNOWN;
  // The position after the prompt; 0 when the prompt is not whole yet or the type is unknown.
  size_t prompt_end = 0;
};

// Recognises acknowledgement and prompt at the start of the bytes. An error text before the prompt
// makes a reply unknown: the command then ends at once and does not wait for a log. A 0 byte counts
// as the end of what has come.
Response RecogniseResponse(std::string_view bytes);

}  // namespace VelmarCommands

#endif  // RCVLINK_VELMAR_RESPONSE_H_
