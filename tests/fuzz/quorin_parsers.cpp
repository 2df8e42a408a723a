// The parsers of Quorin replies: the header of a message, a message of the directory.
#include "quorin/directory_message.h"
#include "quorin/reply_framing.h"
#include "tests/fuzz/target.h"

void fuzz::Target(std::span<const uint8_t> bytes) {
  const std::vector<char> rest = Input(bytes).RestAlone();
  const std::string_view text(rest.data(), rest.size());
  size_t scan_from = 0;
  while (const auto header = QuorinCommands::FindReplyHeader(text, scan_from)) {
    if (header->position + QuorinCommands::kReplyHeaderLength > text.size()) std::abort();
    scan_from = header->position + 1;
  }
  QuorinCommands::ParseDirectoryMessage(text);
}
