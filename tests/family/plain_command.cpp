#include "tests/family/plain_command.h"

#include "platform/hresult.h"

using rcvlink::kTimedOut;

namespace {

constexpr std::string_view kEnd = "\n.\n";
constexpr uint32_t kNoFlags = 0;
constexpr uint32_t kTimeoutMs = 3000;
// The longest answer; a receiver must not fill the host's memory.
constexpr uint32_t kLongestAnswer = 65536;

}  // namespace

CPlainCommand::CPlainCommand(const std::string& line)
    : CReceiverCmd((line + "\n").c_str(), kNoFlags, kTimeoutMs, kTimeoutMs) {}

HRESULT CPlainCommand::Execute(CIConnection* connection, HANDLE abort_event) {
  connection->Flush();
  HRESULT result = Send(connection, GetCommand(), GetCommandLength());
  while (result == S_OK && GetReplyLength() < kLongestAnswer) {
    if (IsCancelled(abort_event)) return S_FALSE;
    char character = 0;
    DWORD count = 0;
    result = connection->Read(&character, sizeof(character), &count, GetReadTimeout());
    if (result != S_OK) break;
    if (count == 0) return kTimedOut;  // how a COM port of Windows tells a silence
    if (AppendReply(&character, count) != S_OK) return E_OUTOFMEMORY;
    if (std::string_view(reinterpret_cast<const char*>(GetReply()), GetReplyLength())
            .ends_with(kEnd)) {
      return S_OK;
    }
  }
  return result == S_OK ? E_FAIL : result;
}

std::string_view CPlainCommand::Answer() const {
  return {reinterpret_cast<const char*>(GetReply()), GetReplyLength() - kEnd.size() + 1};
}
