#include "simulator/program/quorin_program.h"

#include <array>
#include <string>

#include "simulator/program/text_option.h"
#include "simulator/quorin/fault_text.h"

namespace sim {
namespace {

constexpr const char* kReceiverGroup = "Receiver";
constexpr const char* kBlockGroup = "Block faults (BLOCK[@TIMES], blocks from 0, once by default)";
constexpr const char* kReplyGroup =
    "Reply faults (COMMAND is the start of a command, 'ping' the empty line, '*' any; always by "
    "default)";
constexpr const char* kOtherGroup = "Other faults";

struct BlockFaultOption {
  const char* name;
  BlockFaultKind kind;
  const char* help;
};

constexpr std::array<BlockFaultOption, 9> kBlockFaults = {{
    {"--bad-crc", BlockFaultKind::kDamagedCrc, "a damaged CRC"},
    {"--unchained-crc",
     BlockFaultKind::kUnchainedCrc,
     "a CRC that does not go on from the block before"},
    {"--bad-sequence", BlockFaultKind::kWrongSequence, "a wrong sequence number"},
    {"--bad-end", BlockFaultKind::kWrongEnd, "a wrong end byte"},
    {"--lost-byte", BlockFaultKind::kLostByte, "one byte of the payload missing"},
    {"--bad-type", BlockFaultKind::kUnknownType, "an unknown block type"},
    {"--end-block", BlockFaultKind::kEndBlock, "a block of type '#' instead of the block"},
    {"--end-byte", BlockFaultKind::kEndByte, "'#' alone instead of the block"},
    {"--block-silence", BlockFaultKind::kSilence, "silence before the block"},
}};

struct ReplyFaultOption {
  const char* name;
  ReplyFaultKind kind;
  const char* form;
  const char* help;
};

constexpr std::array<ReplyFaultOption, 7> kReplyFaults = {{
    {"--refuse", ReplyFaultKind::kRefused, "COMMAND[@TIMES]", "answer with ER"},
    {"--mute", ReplyFaultKind::kMute, "COMMAND[@TIMES]", "ignore the command"},
    {"--reply-silence", ReplyFaultKind::kSilence, "SECONDS[:COMMAND][@TIMES]", "answer late"},
    {"--garbage",
     ReplyFaultKind::kGarbageBefore,
     "BYTES[:COMMAND][@TIMES]",
     "so many bytes of garbage before the reply"},
    {"--other-tag-first",
     ReplyFaultKind::kOtherTagBefore,
     "COMMAND[@TIMES]",
     "a message with another tag before the reply"},
    {"--other-tag", ReplyFaultKind::kOtherTagOnly, "COMMAND[@TIMES]", "a reply with another tag"},
    {"--bad-length",
     ReplyFaultKind::kWrongLength,
     "BYTES[:COMMAND][@TIMES]",
     "so many bytes added to the length in the header (negative: --bad-length=-3)"},
}};

void AddIdentityOptions(CLI::App& command, QuorinOptions& options) {
  QuorinIdentity& identity = options.identity;
  command.add_option("--id", identity.id, "the receiver's identity")
      ->capture_default_str()
      ->group(kReceiverGroup);
  command.add_option("--model", identity.model, "the receiver's model")
      ->capture_default_str()
      ->group(kReceiverGroup);
  command.add_option("--port-letter", identity.port_letter, "the receiver's serial port, a to d")
      ->capture_default_str()
      ->check(CLI::IsMember({'a', 'b', 'c', 'd'}))
      ->group(kReceiverGroup);
  command
      .add_option(
          "--port-name", identity.port_name, "the port's name on the receiver, e.g. /dev/usb")
      ->group(kReceiverGroup);
  command.add_flag("--echo", options.echo, "echo each byte until the host turns that off")
      ->group(kReceiverGroup);
  command
      .add_flag("--empty-last-block",
                options.empty_last_block,
                "send an empty block after a file that fills its last one")
      ->group(kReceiverGroup);
}

void AddBlockFaults(CLI::App& command, Faults& faults) {
  for (const BlockFaultOption& option : kBlockFaults) {
    const BlockFaultKind kind = option.kind;
    const bool silence = kind == BlockFaultKind::kSilence;
    AddTextOption(command,
                  option.name,
                  silence ? "BLOCK:SECONDS[@TIMES]" : "BLOCK[@TIMES]",
                  option.help,
                  [&faults, kind](const std::string& text) {
                    faults.blocks.push_back(ParseBlockFault(kind, text));
                  })
        ->group(kBlockGroup);
  }
  AddTextOption(
      command,
      "--negative-length",
      "TIMES",
      "a last block with a negative length",
      [&faults](const std::string& text) {
        faults.blocks.push_back({BlockFaultKind::kNegativeLength, 0, ParseTimes(text), 0});
      })
      ->group(kBlockGroup);
  command
      .add_option("--vanish-after",
                  faults.vanish_after_block,
                  "hang up and end after the host has answered the block")
      ->type_name("BLOCK")
      ->group(kBlockGroup);
}

void AddReplyFaults(CLI::App& command, Faults& faults) {
  for (const ReplyFaultOption& option : kReplyFaults) {
    const ReplyFaultKind kind = option.kind;
    AddTextOption(command,
                  option.name,
                  option.form,
                  option.help,
                  [&faults, kind](const std::string& text) {
                    faults.replies.push_back(ParseReplyFault(kind, text));
                  })
        ->group(kReplyGroup);
  }
}

void AddOtherFaults(CLI::App& command, Faults& faults) {
  command.add_flag("--keep-speed", faults.keeps_speed, "refuse to change the line speed")
      ->group(kOtherGroup);
  command.add_flag("--long-names", faults.long_names, "list file names with more than 32 bytes")
      ->group(kOtherGroup);
  AddTextOption(command,
                "--lie-size",
                "NAME=SIZE",
                "give the file this size, whatever is sent",
                [&faults](const std::string& text) { faults.sizes.push_back(ParseSizeLie(text)); })
      ->group(kOtherGroup);
}

}  // namespace

void AddQuorinOptions(CLI::App& command, QuorinOptions& options) {
  AddIdentityOptions(command, options);
  AddBlockFaults(command, options.faults);
  AddReplyFaults(command, options.faults);
  AddOtherFaults(command, options.faults);
}

}  // namespace sim
