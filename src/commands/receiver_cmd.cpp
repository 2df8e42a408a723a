#include "commands/receiver_cmd.h"

#include <algorithm>
#include <cstring>
#include <limits>
#include <new>
#include <utility>

#include "platform/event.h"
#include "transport/wait_scope.h"

using rcvlink::IsSignalled;
using rcvlink::WaitScope;

namespace {

// Null when there is no memory.
std::unique_ptr<uint8_t[]> AllocateBytes(uint32_t length) {
  return std::unique_ptr<uint8_t[]>(new (std::nothrow) uint8_t[length]);
}

}  // namespace

CReceiverCmd::CReceiverCmd(const char* text,
                           uint32_t flags,
                           uint32_t write_timeout_ms,
                           uint32_t read_timeout_ms)
    : flags_(flags), write_timeout_ms_(write_timeout_ms), read_timeout_ms_(read_timeout_ms) {
  // Without its text a command would send a tag alone, which the receiver would take as the beginning
  // of the next one.
  if (!CReceiverCmd::SetCommand(text, static_cast<uint32_t>(std::strlen(text)))) {
    throw std::bad_alloc();
  }
}

bool CReceiverCmd::SetCommand(const void* bytes, uint32_t length) {
  std::unique_ptr<uint8_t[]> copy = AllocateBytes(length);
  if (!copy) return false;
  std::copy_n(static_cast<const uint8_t*>(bytes), length, copy.get());
  command_ = std::move(copy);
  command_length_ = length;
  return true;
}

bool CReceiverCmd::SetCommandText(const char* text) {
  return SetCommand(text, static_cast<uint32_t>(std::strlen(text)));
}

void CReceiverCmd::SetReply(const char* text) {
  try {
    KeepReply(text);
  } catch (const std::bad_alloc&) {
    return;
  }
}

void CReceiverCmd::KeepReply(std::string reply) {
  reply_ = std::move(reply);
  reply_length_ = static_cast<uint32_t>(reply_.size());
  has_reply_ = true;
}

void CReceiverCmd::ReserveReply(size_t length) {
  try {
    reply_.reserve(length);
  } catch (const std::bad_alloc&) {
    return;  // AppendReply tries again
  }
}

void CReceiverCmd::FreeReply() {
  reply_ = std::string();
  has_reply_ = false;
}

HRESULT CReceiverCmd::AppendReply(const void* bytes, uint32_t length) {
  if (!bytes) return E_INVALIDARG;
  if (length == 0) return S_FALSE;
  if (length > std::numeric_limits<uint32_t>::max() - reply_.size()) return E_OUTOFMEMORY;
  try {
    reply_.append(static_cast<const char*>(bytes), length);
  } catch (const std::bad_alloc&) {
    return E_OUTOFMEMORY;
  }
  reply_length_ = static_cast<uint32_t>(reply_.size());
  has_reply_ = true;
  return S_OK;
}

uint32_t CReceiverCmd::GetFlags() const { return flags_; }

void CReceiverCmd::SetFlags(uint32_t flags) { flags_ = flags; }

void CReceiverCmd::SetReadTimeout(uint32_t timeout_ms) { read_timeout_ms_ = timeout_ms; }

uint32_t CReceiverCmd::GetWriteTimeout() const { return write_timeout_ms_; }

uint32_t CReceiverCmd::GetReadTimeout() const { return read_timeout_ms_; }

uint32_t CReceiverCmd::GetCommandLength() const { return command_length_; }

const uint8_t* CReceiverCmd::GetCommand() const { return command_.get(); }

uint32_t CReceiverCmd::GetReplyLength() const { return reply_length_; }

const uint8_t* CReceiverCmd::GetReply() const {
  return has_reply_ ? reinterpret_cast<const uint8_t*>(reply_.data()) : nullptr;
}

bool CReceiverCmd::IsCancelled(HANDLE abort_event) const {
  return cancelled_ || IsSignalled(abort_event);
}

void CReceiverCmd::Cancel() { cancelled_ = true; }

HRESULT CReceiverCmd::Send(CIConnection* connection, const void* bytes, uint32_t length) const {
  if (!sends_whole_) return connection->Write(bytes, length, write_timeout_ms_);
  const WaitScope shield = WaitScope::Shielded(connection);
  return connection->Write(bytes, length, write_timeout_ms_);
}
