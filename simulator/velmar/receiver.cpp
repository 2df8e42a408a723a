#include "simulator/velmar/receiver.h"

#include <algorithm>
#include <utility>

namespace sim {
namespace {

constexpr std::string_view kAcknowledgement = "\r\n<OK\r\n";
constexpr std::string_view kError = "\r\n<ERROR:";
constexpr std::string_view kLineEnd = "\r\n";
constexpr const char* kRefusal = "Refused";

// No reply starts within these: there is no CR, LF or '<' among them.
constexpr std::string_view kGarbage = "\x81$GK\xFF,27*\x0F?";

// How long the port stays open after the last byte, so that a host can read that byte.
constexpr uint64_t kUnplugMs = 500;

Bytes MakeGarbage(int64_t count) {
  Bytes bytes;
  for (int64_t i = 0; i < count; ++i) {
    const size_t index = static_cast<size_t>(i) % kGarbage.size();
    bytes.push_back(static_cast<uint8_t>(kGarbage[index]));
  }
  return bytes;
}

}  // namespace

VelmarReceiver::VelmarReceiver(const VelmarOptions& options,
                               FileStore files,
                               Transcript* transcript)
    : transcript_(transcript != nullptr ? *transcript : silent_transcript_),
      line_(options.line, transcript_),
      commands_(options.identity, options.listing, std::move(files)),
      faults_(options.faults),
      piece_size_(options.line.piece_size),
      chunk_length_(options.chunk_length),
      bare_errors_(options.bare_errors),
      stops_for_commands_(options.stops_for_commands) {}

VelmarReceiver::~VelmarReceiver() {
  if (!reader_.unfinished().empty()) {
    transcript_.FromHost(reader_.unfinished());
  }
}

void VelmarReceiver::Receive(std::span<const uint8_t> bytes, uint32_t host_speed, uint64_t now_ms) {
  for (const uint8_t byte : bytes) {
    // One byte at a time: a command may change the speed at which the rest is heard.
    const std::optional<uint8_t> heard = line_.Hear(byte, host_speed);
    if (!heard && !unheard_) {
      transcript_.Remark("not heard at " + std::to_string(host_speed));
    }
    unheard_ = !heard.has_value();
    if (!heard || gone_) {
      continue;
    }
    if (const std::optional<std::string> command = reader_.Push(*heard)) {
      transcript_.FromHost(*command + '\r');
      HearCommand(*command, now_ms);
    }
  }
}

size_t VelmarReceiver::EndOfSpeedCommand(std::span<const uint8_t> bytes) const {
  return EndOfPortCommand(reader_.unfinished(), bytes);
}

void VelmarReceiver::HearCommand(std::string_view command, uint64_t now_ms) {
  command.remove_prefix(std::min(command.find_first_not_of(' '), command.size()));
  if (command.empty() || TakeReplyFault(faults_, VelmarReplyFaultKind::kMute, command)) {
    return;
  }
  const VelmarAnswer answer = Execute(command);
  if (transfer_ && (answer.stop_logs || stops_for_commands_)) {
    transcript_.Remark("transfer stopped");
    transfer_.reset();
  }
  if (!answer.setting.empty()) {
    transcript_.Setting(answer.setting);
  }
  SendAnswer(command, answer, now_ms);
}

VelmarAnswer VelmarReceiver::Execute(std::string_view command) {
  VelmarAnswer refusal;
  refusal.error = kRefusal;
  if (TakeReplyFault(faults_, VelmarReplyFaultKind::kRefused, command)) {
    return refusal;
  }
  if (TakeReplyFault(faults_, VelmarReplyFaultKind::kRefusedBare, command)) {
    refusal.bare = true;
    return refusal;
  }
  VelmarAnswer answer = commands_.Execute(command, line_.speed(), faults_);
  answer.bare = bare_errors_;
  return answer;
}

void VelmarReceiver::SendAnswer(std::string_view command,
                                const VelmarAnswer& answer,
                                uint64_t now_ms) {
  const auto take = [&](VelmarReplyFaultKind kind) {
    return TakeReplyFault(faults_, kind, command);
  };
  uint64_t due_ms = now_ms;
  if (const auto silence = take(VelmarReplyFaultKind::kSilence)) {
    due_ms += static_cast<uint64_t>(silence->amount);
  }
  if (const auto garbage = take(VelmarReplyFaultKind::kGarbageBefore)) {
    QueueText(ToText(MakeGarbage(garbage->amount)), due_ms);
  }

  std::string text(kAcknowledgement);
  if (!answer.error.empty()) {
    text = kError;
    text += answer.bare ? "" : answer.error + std::string(kLineEnd);
  }
  if (const auto late = take(VelmarReplyFaultKind::kLatePrompt)) {
    QueueText(std::exchange(text, {}), due_ms);
    due_ms += static_cast<uint64_t>(late->amount);
  }
  text += '[';
  if (const auto endless = take(VelmarReplyFaultKind::kEndlessPrompt)) {
    QueueText(text, due_ms);
    line_.Queue({Bytes(static_cast<size_t>(endless->amount), 'X'),
                 due_ms,
                 "prompt of " + std::to_string(endless->amount) + " bytes without end"});
    return;
  }
  text += commands_.port_name() + ']';
  if (take(VelmarReplyFaultKind::kLineEndAfterPrompt)) {
    text += kLineEnd;
  }
  Output output{ToBytes(text), due_ms, Escape(text)};
  output.speed_after = answer.speed_after_reply;
  line_.Queue(std::move(output));

  if (take(VelmarReplyFaultKind::kAbbreviatedLog)) {
    QueueText(FrameAbbreviatedLog("STATUS", commands_.port_name()), due_ms);
    return;
  }
  if (!answer.logs.empty()) {
    SendLogs(command, answer.logs, due_ms);
  }
  if (answer.transfer) {
    StartTransfer(command, *answer.transfer);
  }
}

void VelmarReceiver::SendLogs(std::string_view command,
                              std::vector<AsciiLog> logs,
                              uint64_t due_ms) {
  const auto take = [&](VelmarReplyFaultKind kind) {
    return TakeReplyFault(faults_, kind, command);
  };
  if (const auto late = take(VelmarReplyFaultKind::kLateLog)) {
    due_ms += static_cast<uint64_t>(late->amount);
  }
  AsciiLog& last = logs.back();
  const auto count = last.counted ? take(VelmarReplyFaultKind::kCount) : std::nullopt;
  if (count) {
    last.body = WithFirstField(last.body, std::to_string(count->amount));
  }
  if (const auto fields = take(VelmarReplyFaultKind::kFewerFields)) {
    for (AsciiLog& log : logs) {
      log.body = FirstFields(log.body, static_cast<size_t>(fields->amount));
    }
  }
  if (take(VelmarReplyFaultKind::kOpenQuotes)) {
    last.body = LeftOpen(last.body);
  }
  const bool damaged_crc = take(VelmarReplyFaultKind::kDamagedCrc).has_value();
  const std::vector<uint32_t> sequence = SequenceNumbers(command, logs.size());
  for (size_t i = 0; i < logs.size(); ++i) {
    QueueText(FrameAsciiLog(logs[i], commands_.port_name(), sequence[i], damaged_crc), due_ms);
  }
}

std::vector<uint32_t> VelmarReceiver::SequenceNumbers(std::string_view command, size_t count) {
  std::vector<uint32_t> numbers(count);
  for (size_t i = 0; i < count; ++i) {
    numbers[i] = static_cast<uint32_t>(count - 1 - i);
  }
  const auto raise = [&](size_t end) {
    std::for_each_n(numbers.begin(), end, [](uint32_t& number) { ++number; });
  };
  if (count > 1) {
    if (const auto gap = TakeReplyFault(faults_, VelmarReplyFaultKind::kSequenceGap, command)) {
      raise(std::min(static_cast<size_t>(gap->amount), count - 1));
    }
  }
  if (TakeReplyFault(faults_, VelmarReplyFaultKind::kSequenceOpen, command)) {
    raise(count);
  }
  return numbers;
}

void VelmarReceiver::QueueText(std::string_view text, uint64_t not_before_ms) {
  line_.Queue({ToBytes(text), not_before_ms, Escape(text)});
}

void VelmarReceiver::StartTransfer(std::string_view command, const FileEntry& file) {
  transfer_.emplace(commands_.files(), file, chunk_length_, commands_.port_name());
  silence_ms_ = 0;
  silent_until_ms_ = 0;
  if (const auto late = TakeReplyFault(faults_, VelmarReplyFaultKind::kLateLog, command)) {
    silence_ms_ = static_cast<uint64_t>(late->amount);
  }
  TakeChunkSilence();
}

std::optional<uint64_t> VelmarReceiver::NextSendTime() const {
  if (const std::optional<uint64_t> next = line_.NextSendTime()) {
    return next;
  }
  return transfer_ ? silent_until_ms_ : vanish_ms_;
}

Bytes VelmarReceiver::Send(uint64_t now_ms, uint32_t host_speed) {
  if (vanish_ms_ && *vanish_ms_ <= now_ms) {
    gone_ = true;
    transcript_.Remark("gone");
    return {};
  }
  while (ChunkDue(now_ms)) {
    SendChunk();
  }
  Bytes bytes = line_.Send(now_ms, host_speed);
  if (line_.Idle()) {
    NoteIdleLine(now_ms);
  }
  return bytes;
}

// A chunk is made when the line has sent everything before it. It is made earlier only where a piece
// holds the end of one chunk and the start of the next.
bool VelmarReceiver::ChunkDue(uint64_t now_ms) const {
  return transfer_ && silence_ms_ == 0 && silent_until_ms_ <= now_ms &&
         line_.Waiting() < std::max<size_t>(piece_size_, 1);
}

void VelmarReceiver::SendChunk() {
  std::optional<VelmarChunk> chunk = transfer_->CurrentChunk(faults_);
  if (!chunk) {
    transcript_.Remark("file lost");
    transfer_.reset();
    return;
  }
  line_.Queue({std::move(chunk->wire), silent_until_ms_, std::move(chunk->description)});
  last_block_ = transfer_->chunk_number();
  vanishes_ = faults_.vanish_after_chunk == transfer_->chunk_number();
  if (vanishes_ || transfer_->at_last_chunk()) {
    transfer_.reset();
    return;
  }
  transfer_->Next();
  TakeChunkSilence();
}

void VelmarReceiver::TakeChunkSilence() {
  const auto silence =
      TakeChunkFault(faults_, VelmarChunkFaultKind::kSilence, transfer_->chunk_number());
  silence_ms_ += silence ? silence->amount : 0;
}

void VelmarReceiver::NoteIdleLine(uint64_t now_ms) {
  if (transfer_ && silence_ms_ > 0) {
    silent_until_ms_ = now_ms + std::exchange(silence_ms_, 0);
  }
  if (std::exchange(vanishes_, false)) {
    vanish_ms_ = now_ms + kUnplugMs;
  }
}

}  // namespace sim
