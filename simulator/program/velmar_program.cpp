#include "simulator/program/velmar_program.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

#include "simulator/program/text_option.h"
#include "simulator/velmar/fault_text.h"

namespace sim {
namespace {

constexpr const char* kReceiverGroup = "Receiver";
constexpr const char* kChunkGroup = "Chunk faults (CHUNK[@TIMES], chunks from 0, once by default)";
constexpr const char* kReplyGroup =
    "Reply faults (COMMAND is the start of a command, '*' any; always by default)";
constexpr const char* kOtherGroup = "Other faults";

struct ChunkFaultOption {
  const char* name;
  VelmarChunkFaultKind kind;
  const char* form;
  const char* help;
};

constexpr std::array<ChunkFaultOption, 8> kChunkFaults = {{
    {"--bad-crc", VelmarChunkFaultKind::kDamagedCrc, "CHUNK[@TIMES]", "a damaged CRC"},
    {"--flipped-bit", VelmarChunkFaultKind::kFlippedBit, "CHUNK[@TIMES]", "a wrong bit of data"},
    {"--forged-bit",
     VelmarChunkFaultKind::kForgedBit,
     "CHUNK[@TIMES]",
     "a wrong bit of data, and the CRC fits"},
    {"--bad-sync", VelmarChunkFaultKind::kWrongSync, "CHUNK[@TIMES]", "wrong sync bytes 2 and 3"},
    {"--message-length",
     VelmarChunkFaultKind::kMessageLength,
     "CHUNK:BYTES[@TIMES]",
     "another message length in the header"},
    {"--body-length",
     VelmarChunkFaultKind::kBodyLength,
     "CHUNK:BYTES[@TIMES]",
     "a message of another length, cut off or filled up with zeros"},
    {"--header-length",
     VelmarChunkFaultKind::kHeaderLength,
     "CHUNK:BYTES[@TIMES]",
     "another header length in the header"},
    {"--chunk-silence",
     VelmarChunkFaultKind::kSilence,
     "CHUNK:SECONDS[@TIMES]",
     "silence before the chunk"},
}};

struct ReplyFaultOption {
  const char* name;
  VelmarReplyFaultKind kind;
  const char* form;
  const char* help;
};

constexpr const char* kCommandForm = "COMMAND[@TIMES]";
constexpr const char* kSecondsForm = "SECONDS[:COMMAND][@TIMES]";
constexpr const char* kBytesForm = "BYTES[:COMMAND][@TIMES]";
constexpr const char* kNumberForm = "NUMBER[:COMMAND][@TIMES]";

constexpr std::array<ReplyFaultOption, 16> kReplyFaults = {{
    {"--refuse", VelmarReplyFaultKind::kRefused, kCommandForm, "answer with an error"},
    {"--refuse-bare",
     VelmarReplyFaultKind::kRefusedBare,
     kCommandForm,
     "answer with an error that has no text"},
    {"--mute", VelmarReplyFaultKind::kMute, kCommandForm, "ignore the command"},
    {"--reply-silence", VelmarReplyFaultKind::kSilence, kSecondsForm, "answer late"},
    {"--late-prompt",
     VelmarReplyFaultKind::kLatePrompt,
     kSecondsForm,
     "a pause between acknowledgement and prompt"},
    {"--late-log",
     VelmarReplyFaultKind::kLateLog,
     kSecondsForm,
     "a pause between prompt and first log"},
    {"--garbage",
     VelmarReplyFaultKind::kGarbageBefore,
     kBytesForm,
     "so many bytes of garbage before the reply"},
    {"--endless-prompt",
     VelmarReplyFaultKind::kEndlessPrompt,
     kBytesForm,
     "a prompt of so many bytes that does not end"},
    {"--line-end-after-prompt",
     VelmarReplyFaultKind::kLineEndAfterPrompt,
     kCommandForm,
     "CR LF after the prompt"},
    {"--abbreviated-log",
     VelmarReplyFaultKind::kAbbreviatedLog,
     kCommandForm,
     "an abbreviated log after the prompt, and nothing else"},
    {"--bad-log-crc",
     VelmarReplyFaultKind::kDamagedCrc,
     kCommandForm,
     "a damaged CRC in ASCII logs"},
    {"--open-quotes",
     VelmarReplyFaultKind::kOpenQuotes,
     kCommandForm,
     "a last log that ends within quotation marks"},
    {"--fields",
     VelmarReplyFaultKind::kFewerFields,
     kNumberForm,
     "log bodies that end after so many fields"},
    {"--count",
     VelmarReplyFaultKind::kCount,
     kNumberForm,
     "another number of components or ports in logs (negative: --count=-1)"},
    {"--sequence-gap",
     VelmarReplyFaultKind::kSequenceGap,
     kNumberForm,
     "a sequence number is left out before this log (logs from 0; at least 1)"},
    {"--sequence-open",
     VelmarReplyFaultKind::kSequenceOpen,
     kCommandForm,
     "sequence numbers of logs that end at 1"},
}};

void AddReceiverOptions(CLI::App& command, VelmarOptions& options) {
  VelmarIdentity& identity = options.identity;
  command.add_option("--id", identity.id, "the receiver's serial number")
      ->capture_default_str()
      ->group(kReceiverGroup);
  command.add_option("--model", identity.model, "the receiver's model")
      ->capture_default_str()
      ->group(kReceiverGroup);
  command
      .add_option(
          "--port-name", identity.port_name, "the port's name on the receiver, e.g. COM2 or USB1")
      ->capture_default_str()
      ->group(kReceiverGroup);
  // The first one given replaces the default ones.
  auto replaced = std::make_shared<bool>(false);
  AddTextOption(command,
                "--component",
                "TYPE[:MODEL]",
                "a component in the version log, in the order given",
                [&identity, replaced](const std::string& text) {
                  if (!*replaced) {
                    identity.components.clear();
                    *replaced = true;
                  }
                  identity.components.push_back(ParseComponent(text));
                })
      ->group(kReceiverGroup);
  command
      .add_flag(
          "--no-components",
          [&identity](int64_t) { identity.components.clear(); },
          "a version log without components")
      ->group(kReceiverGroup);
  command.add_option("--chunk", options.chunk_length, "the bytes of a file in one log")
      ->capture_default_str()
      ->check(CLI::Range(size_t{1}, kMaxChunkLength))
      ->type_name("BYTES")
      ->group(kReceiverGroup);
  command
      .add_flag(
          "--quoted-names", options.listing.quoted_names, "list file names in quotation marks")
      ->group(kReceiverGroup);
  command
      .add_flag("--blank-entry",
                options.listing.blank_entry,
                "list an empty directory as one file without a name")
      ->group(kReceiverGroup);
  command.add_flag("--bare-errors", options.bare_errors, "answer with errors that have no text")
      ->group(kReceiverGroup);
  command
      .add_flag("--stop-for-commands",
                options.stops_for_commands,
                "end a transfer at any command, not only at unlogall")
      ->group(kReceiverGroup);
}

void AddChunkFaults(CLI::App& command, VelmarFaults& faults) {
  for (const ChunkFaultOption& option : kChunkFaults) {
    const VelmarChunkFaultKind kind = option.kind;
    AddTextOption(command,
                  option.name,
                  option.form,
                  option.help,
                  [&faults, kind](const std::string& text) {
                    faults.chunks.push_back(ParseChunkFault(kind, text));
                  })
        ->group(kChunkGroup);
  }
  command
      .add_flag("--endless-sequence",
                faults.endless_sequence,
                "a last chunk that says another one follows")
      ->group(kChunkGroup);
  command
      .add_option(
          "--vanish-after", faults.vanish_after_chunk, "hang up and end after the chunk has left")
      ->type_name("CHUNK")
      ->group(kChunkGroup);
}

void AddReplyFaults(CLI::App& command, VelmarFaults& faults) {
  for (const ReplyFaultOption& option : kReplyFaults) {
    const VelmarReplyFaultKind kind = option.kind;
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

void AddOtherFaults(CLI::App& command, VelmarFaults& faults) {
  command
      .add_flag("--keep-speed",
                faults.keeps_speed,
                "acknowledge commands that change the port, and ignore them")
      ->group(kOtherGroup);
  command
      .add_flag("--hide-port",
                faults.hides_own_port,
                "list the ports without the one that the host is on")
      ->group(kOtherGroup);
  AddTextOption(command,
                "--lie-size",
                "NAME=SIZE",
                "give the file this size, whatever is sent",
                [&faults](const std::string& text) { faults.sizes.push_back(ParseSizeLie(text)); })
      ->group(kOtherGroup);
}

}  // namespace

void AddVelmarOptions(CLI::App& command, VelmarOptions& options) {
  AddReceiverOptions(command, options);
  AddChunkFaults(command, options.faults);
  AddReplyFaults(command, options.faults);
  AddOtherFaults(command, options.faults);
}

}  // namespace sim
