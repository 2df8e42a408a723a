// A connection whose other end is a script: it records every call in order and answers reads from a
// queue. Nothing waits: a read that finds the queue empty times out at once. A Cancel ends the next
// read; a Cancel during a read is too late for this read.
#ifndef RCVLINK_TESTS_SUPPORT_SCRIPTED_CONNECTION_H_
#define RCVLINK_TESTS_SUPPORT_SCRIPTED_CONNECTION_H_

#include <deque>
#include <functional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "platform/api_types.h"
#include "transport/connection.h"

class ScriptedConnection : public CIConnection {
 public:
  // What one Read gives. Bytes that were not asked for stay for the next Read.
  struct Answer {
    HRESULT result = S_OK;
    std::string bytes;
    std::function<void()> before;  // runs as the read begins; may be empty
  };

  // The script.
  void GiveRead(std::string bytes) { answers_.push_back({S_OK, std::move(bytes), {}}); }
  void GiveResult(HRESULT result) { answers_.push_back({result, {}, {}}); }
  void Give(Answer answer) { answers_.push_back(std::move(answer)); }
  void DropAnswers() { answers_.clear(); }
  // Called with all bytes of each write; it returns the result of the write. May call GiveRead.
  std::function<HRESULT(std::string_view)> on_write;
  std::function<HRESULT()> on_flush;
  std::function<void()> on_cancel;
  HRESULT instance_type_result = S_OK;
  EInstanceType instance_type = eInstanceSerial;
  HRESULT speed_result = S_OK;
  DWORD speed = 9600;
  HRESULT set_speed_result = S_OK;
  HRESULT name_result = S_OK;
  std::wstring name = L"COM7";
  bool* destroyed = nullptr;  // set by the destructor

  // What happened. Calls are named "flush", "write <bytes>", "read <size> <time-out>", "cancel",
  // "speed <rate>", "disconnect".
  std::vector<std::string> calls;
  std::vector<std::string> Writes() const;  // the bytes of each write
  std::string Written() const;              // all of them
  std::vector<DWORD> write_timeouts;        // of each write
  rcvlink::WaitRule wait_rule;              // the one in force
  bool is_cancelled = false;                // a Cancel has not ended a read yet
  size_t AnswersLeft() const { return answers_.size(); }

  ~ScriptedConnection() override;
  HRESULT Disconnect() override;
  HRESULT Read(void* buffer, DWORD size, DWORD* bytes_read, DWORD timeout_ms) override;
  HRESULT Write(const void* buffer, DWORD size, DWORD timeout_ms) override;
  HRESULT Flush() override;
  void Cancel() override;
  HRESULT GetInstanceType(EInstanceType* type) override;
  HRESULT GetName(BSTR* name) override;
  HRESULT GetSpeed(DWORD* speed) override;
  void SetAbortEvent(HANDLE) override {}
  HRESULT SetSpeed(DWORD speed) override;
  void ClearCancel() override { is_cancelled = false; }
  rcvlink::WaitRule ExchangeWaitRule(const rcvlink::WaitRule& rule) override {
    return std::exchange(wait_rule, rule);
  }

 private:
  std::deque<Answer> answers_;
  std::vector<std::string> writes_;
};

#endif  // RCVLINK_TESTS_SUPPORT_SCRIPTED_CONNECTION_H_
