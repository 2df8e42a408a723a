#include "velmar/response.h"

namespace VelmarCommands {
namespace {

constexpr std::string_view kOpening = "\r\n<";
constexpr std::string_view kOkLine = "\r\n<OK\r\n";
// The acknowledgement, or the beginning of a refusal, and one byte of what follows.
constexpr size_t kEnoughForOk = 8;
constexpr size_t kEnoughForError = 10;

// Evaluates the reply after its acknowledgement.
Response WithPrompt(std::string_view bytes, ResponseType acknowledgement, size_t cursor) {
  const auto byte_at = [&](size_t i) { return i < bytes.size() ? bytes[i] : '\0'; };
  if (byte_at(cursor) == '\0') return {RESPONSE_INCOMPLETE};
  if (byte_at(cursor) != '[') return {RESPONSE_UNKNOWN};
  while (byte_at(cursor) != ']') {
    if (byte_at(cursor) == '\0') return {RESPONSE_INCOMPLETE};
    ++cursor;
  }
  return {acknowledgement, cursor + 1};
}

}  // namespace

Response RecogniseResponse(std::string_view bytes) {
  const std::string_view opening = bytes.substr(0, kOpening.size());
  if (!kOpening.starts_with(opening)) return {RESPONSE_UNKNOWN};
  if (bytes.size() < kEnoughForOk) return {RESPONSE_INCOMPLETE};
  if (bytes.starts_with(kOkLine)) return WithPrompt(bytes, RESPONSE_OK, kOkLine.size());
  if (bytes.size() < kEnoughForError) return {RESPONSE_INCOMPLETE};
  if (bytes.starts_with(kRefusal)) return WithPrompt(bytes, RESPONSE_ERROR, kRefusal.size());
  return {RESPONSE_UNKNOWN};
}

}  // namespace VelmarCommands
