#include "tests/support/scripted_connection.h"

#include <algorithm>
#include <utility>

#include "platform/hresult.h"
#include "platform/text.h"

using rcvlink::CopyBstr;
using rcvlink::kTimedOut;

std::vector<std::string> ScriptedConnection::Writes() const { return writes_; }

std::string ScriptedConnection::Written() const {
  std::string all;
  for (const std::string& bytes : writes_) all += bytes;
  return all;
}

ScriptedConnection::~ScriptedConnection() {
  if (destroyed) *destroyed = true;
}

HRESULT ScriptedConnection::Disconnect() {
  calls.push_back("disconnect");
  return S_OK;
}

HRESULT ScriptedConnection::Read(void* buffer, DWORD size, DWORD* bytes_read, DWORD timeout_ms) {
  calls.push_back("read " + std::to_string(size) + " " + std::to_string(timeout_ms));
  *bytes_read = 0;
  if (!wait_rule.shielded && std::exchange(is_cancelled, false)) return S_FALSE;
  if (answers_.empty()) return kTimedOut;
  if (auto before = std::exchange(answers_.front().before, {})) before();
  Answer& answer = answers_.front();
  const size_t count = std::min<size_t>(size, answer.bytes.size());
  std::copy_n(answer.bytes.begin(), count, static_cast<char*>(buffer));
  *bytes_read = static_cast<DWORD>(count);
  const HRESULT result = answer.result;
  answer.bytes.erase(0, count);
  if (answer.bytes.empty()) answers_.pop_front();
  return result;
}

HRESULT ScriptedConnection::Write(const void* buffer, DWORD size, DWORD timeout_ms) {
  const std::string bytes(static_cast<const char*>(buffer), size);
  calls.push_back("write " + bytes);
  writes_.push_back(bytes);
  write_timeouts.push_back(timeout_ms);
  return on_write ? on_write(bytes) : S_OK;
}

HRESULT ScriptedConnection::Flush() {
  calls.push_back("flush");
  return on_flush ? on_flush() : S_OK;
}

void ScriptedConnection::Cancel() {
  calls.push_back("cancel");
  is_cancelled = true;
  if (on_cancel) on_cancel();
}

HRESULT ScriptedConnection::GetInstanceType(EInstanceType* type) {
  *type = instance_type;
  return instance_type_result;
}

HRESULT ScriptedConnection::GetName(BSTR* out) {
  *out = nullptr;
  if (SUCCEEDED(name_result)) *out = CopyBstr(name.c_str()).release();
  return name_result;
}

HRESULT ScriptedConnection::GetSpeed(DWORD* out) {
  *out = speed;
  return speed_result;
}

HRESULT ScriptedConnection::SetSpeed(DWORD rate) {
  calls.push_back("speed " + std::to_string(rate));
  if (SUCCEEDED(set_speed_result)) speed = rate;
  return set_speed_result;
}
