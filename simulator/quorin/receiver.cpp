#include "simulator/quorin/receiver.h"

#include <utility>

#include "simulator/quorin/reply.h"

namespace sim {
namespace {

// No message starts within these: there is no blank, 'E' or 'R' among them.
constexpr std::string_view kGarbage = "\x81$GK\xFF,27*\x0F?";

Bytes MakeGarbage(int32_t count) {
  Bytes bytes;
  for (int32_t i = 0; i < count; ++i) {
    const size_t index = static_cast<size_t>(i) % kGarbage.size();
    bytes.push_back(static_cast<uint8_t>(kGarbage[index]));
  }
  return bytes;
}

// A tag that no host is waiting for.
std::optional<std::string> OtherTag(const std::optional<std::string>& tag) {
  return tag.value_or("") + "9";
}

}  // namespace

QuorinReceiver::QuorinReceiver(const QuorinOptions& options,
                               FileStore files,
                               Transcript* transcript)
    : transcript_(transcript != nullptr ? *transcript : silent_transcript_),
      line_(options.line, transcript_),
      commands_(options.identity, std::move(files)),
      faults_(options.faults),
      echo_(options.echo),
      empty_last_block_(options.empty_last_block) {}

QuorinReceiver::~QuorinReceiver() {
  if (!reader_.unfinished().empty()) {
    transcript_.FromHost(reader_.unfinished());
  }
}

void QuorinReceiver::Receive(std::span<const uint8_t> bytes, uint32_t host_speed, uint64_t now_ms) {
  for (const uint8_t byte : bytes) {
    // One byte at a time: a command may change the speed at which the rest is heard.
    const std::optional<uint8_t> heard = line_.Hear(byte, host_speed);
    if (heard) {
      HearByte(*heard, now_ms);
    } else if (!unheard_) {
      transcript_.Remark("not heard at " + std::to_string(host_speed));
    }
    unheard_ = !heard.has_value();
  }
  FlushEcho({}, now_ms);
}

std::optional<uint64_t> QuorinReceiver::NextSendTime() const { return line_.NextSendTime(); }

Bytes QuorinReceiver::Send(uint64_t now_ms, uint32_t host_speed) {
  return line_.Send(now_ms, host_speed);
}

size_t QuorinReceiver::EndOfSpeedCommand(std::span<const uint8_t> bytes) const {
  const std::string_view text(reinterpret_cast<const char*>(bytes.data()), bytes.size());
  const size_t rate = text.rfind("/rate,");
  const size_t end = rate == std::string_view::npos ? rate : text.find('\n', rate);
  return end == std::string_view::npos ? 0 : end + 1;
}

void QuorinReceiver::HearByte(uint8_t byte, uint64_t now_ms) {
  if (gone_) {
    return;
  }
  const bool ends_transfer = transfer_ && byte == kTransferEnd;
  if (byte == kTransferAck || byte == kTransferNak || ends_transfer) {
    HearControl(byte, now_ms);
    return;
  }
  if (echo_ && !transfer_) {
    unsent_echo_.push_back(byte);
  }
  if (const std::optional<CommandLine> line = reader_.Push(byte)) {
    HearLine(*line, now_ms);
  }
}

void QuorinReceiver::HearControl(uint8_t byte, uint64_t now_ms) {
  transcript_.FromHost(byte);
  if (!transfer_) {
    return;
  }
  if (block_crc_ && faults_.vanish_after_block == transfer_->block_number() && line_.Idle()) {
    gone_ = true;
    transcript_.Remark("gone");
    return;
  }
  if (byte == kTransferEnd) {
    transfer_.reset();
    line_.DropOutput();
    reader_.RestartAfterHash();
    return;
  }
  // An answer counts only between two blocks. One that comes while a block has not left yet cannot
  // be meant for that block, and would make the receiver send blocks twice.
  if (line_.Idle()) {
    HearTransferAnswer(byte == kTransferAck, now_ms);
  }
}

void QuorinReceiver::HearTransferAnswer(bool accepted, uint64_t now_ms) {
  if (accepted) {
    if (!block_crc_) {
      return;
    }
    if (transfer_->at_last_block()) {
      transfer_.reset();
      return;
    }
    transfer_->Accept(*block_crc_);
  }
  SendBlock(now_ms);
}

void QuorinReceiver::HearLine(const CommandLine& line, uint64_t now_ms) {
  transcript_.FromHost(line.raw);
  FlushEcho(line.raw, now_ms);
  if (transfer_) {
    if (line.text.empty()) {
      return;
    }
    // A host that starts anew does not know of a transfer that the last one left.
    transcript_.Remark("transfer abandoned");
    transfer_.reset();
    line_.DropOutput();
  }
  Execute(SplitTag(line.text), now_ms);
}

void QuorinReceiver::FlushEcho(std::string_view line, uint64_t now_ms) {
  if (unsent_echo_.empty()) {
    return;
  }
  const std::string description = line.empty() ? "" : "echo " + Escape(line);
  line_.Queue({std::exchange(unsent_echo_, {}), now_ms, description});
}

void QuorinReceiver::Execute(const Command& command, uint64_t now_ms) {
  const bool answered = command.tag.has_value() || !IsSilentWithoutTag(command.text);
  if (TakeReplyFault(faults_, ReplyFaultKind::kMute, command.text, answered)) {
    return;
  }
  Answer answer;
  if (TakeReplyFault(faults_, ReplyFaultKind::kRefused, command.text, answered)) {
    answer.ok = false;
    answer.texts = {"{refused}"};
  } else {
    answer = commands_.Execute(command.text, faults_);
  }

  if (answer.stop_output) {
    line_.DropOutput();
  }
  if (answer.echo) {
    echo_ = *answer.echo;
  }
  if (!answer.setting.empty()) {
    transcript_.Setting(answer.setting);
  }
  if (answer.speed_at_once) {
    line_.SetSpeed(*answer.speed_at_once);
  }
  if (answered) {
    SendAnswer(command, answer, now_ms);
  } else if (answer.speed_after_reply) {
    line_.SetSpeed(*answer.speed_after_reply);
  }
  if (answer.transfer) {
    transfer_.emplace(
        commands_.files(), answer.transfer->file, answer.transfer->block_length, empty_last_block_);
    block_crc_.reset();
  }
}

void QuorinReceiver::SendAnswer(const Command& command, const Answer& answer, uint64_t now_ms) {
  const auto take = [&](ReplyFaultKind kind) {
    return TakeReplyFault(faults_, kind, command.text, true);
  };
  uint64_t due_ms = now_ms;
  if (const auto silence = take(ReplyFaultKind::kSilence)) {
    due_ms += static_cast<uint64_t>(silence->amount);
  }
  if (const auto garbage = take(ReplyFaultKind::kGarbageBefore)) {
    QueueMessage(MakeGarbage(garbage->amount), due_ms);
  }
  if (take(ReplyFaultKind::kOtherTagBefore)) {
    QueueMessage(FrameReply(kReplyOk, OtherTag(command.tag), "another"), due_ms);
  }
  const auto wrong_length = take(ReplyFaultKind::kWrongLength);
  const auto tag = take(ReplyFaultKind::kOtherTagOnly) ? OtherTag(command.tag) : command.tag;

  for (size_t i = 0; i < answer.texts.size(); ++i) {
    Output output;
    output.bytes = FrameReply(answer.ok ? kReplyOk : kReplyError,
                              tag,
                              answer.texts[i],
                              wrong_length ? wrong_length->amount : 0);
    output.not_before_ms = due_ms;
    output.description = Escape(output.bytes);
    if (i + 1 == answer.texts.size()) {
      output.speed_after = answer.speed_after_reply;
    }
    line_.Queue(std::move(output));
  }
}

void QuorinReceiver::QueueMessage(Bytes message, uint64_t not_before_ms) {
  std::string description = Escape(message);
  line_.Queue({std::move(message), not_before_ms, std::move(description)});
}

void QuorinReceiver::SendBlock(uint64_t now_ms) {
  const uint32_t number = transfer_->block_number();
  const std::optional<Block> block = transfer_->CurrentBlock();
  if (!block) {
    QueueBlock(transfer_->EndBlock(), std::nullopt, now_ms);
    transfer_.reset();
    return;
  }
  block_crc_ = block->crc;
  last_block_ = number;
  const uint64_t due_ms = now_ms + TakeBlockSilence(faults_, number);
  const auto fault = TakeBlockFault(faults_, number, transfer_->at_last_block());
  QueueBlock(fault ? transfer_->Spoil(*block, *fault) : *block, fault, due_ms);
  if (fault == BlockFaultKind::kEndBlock || fault == BlockFaultKind::kEndByte) {
    transfer_.reset();
  }
}

void QuorinReceiver::QueueBlock(const Block& block,
                                std::optional<BlockFaultKind> fault,
                                uint64_t not_before_ms) {
  line_.Queue({block.wire, not_before_ms, DescribeBlock(block, fault)});
}

}  // namespace sim
