// A Velmar receiver that answers what the input says. The input is a list of steps, one for each command of the
// host, and the next ones as long as the kind has kMore. The library does not compare the checksums of logs, so
// they need not be right.
#ifndef RCVLINK_TESTS_FUZZ_VELMAR_SCRIPT_H_
#define RCVLINK_TESTS_FUZZ_VELMAR_SCRIPT_H_

#include "platform/hresult.h"
#include "tests/fuzz/target.h"
#include "tests/support/scripted_connection.h"
#include "tests/velmar/velmar_replies.h"

namespace fuzz {

class VelmarScript {
 public:
  VelmarScript(ScriptedConnection& connection, Input input)
      : connection_(connection), input_(input) {
    connection.on_write = [this](std::string_view) { return Hear(); };
  }
  VelmarScript(const VelmarScript&) = delete;
  VelmarScript& operator=(const VelmarScript&) = delete;

 private:
  static constexpr uint8_t kMore = 0x80;
  static constexpr uint8_t kKinds = 9;

  HRESULT Hear() {
    bool more = true;
    while (more && !input_.AtEnd()) {
      const uint8_t kind = input_.Byte();
      more = (kind & kMore) != 0;
      if (const HRESULT result = Take((kind & ~kMore) % kKinds); FAILED(result)) return result;
    }
    return S_OK;
  }

  HRESULT Take(int kind) {
    switch (kind) {
      case 0:
        connection_.GiveRead(input_.Text());
        break;
      case 1:
        connection_.GiveRead(kOkPrompt);
        break;
      case 2:
        connection_.GiveRead("\r\n<ERROR:" + input_.Text() + "\r\n[COM1]");
        break;
      case 3:
        connection_.GiveRead(kOkPrompt + Log());
        break;
      case 4:
        connection_.GiveResult(rcvlink::kTimedOut);
        break;
      case 5:
        connection_.GiveResult(rcvlink::HResultFromError(input_.Word()));
        break;
      case 6: {
        const uint16_t sequence = input_.Word();
        connection_.GiveRead(BinaryLog{input_.Text(), sequence}.Bytes());
        break;
      }
      case 7:
        connection_.GiveRead(Log());
        break;
      default:  // the write fails
        return rcvlink::HResultFromError(input_.Word());
    }
    return S_OK;
  }

  std::string Log() {
    constexpr const char* kNames[] = {"VERSIONA", "DIRENTA", "FILEHDRA", "COMCONFIGA"};
    const std::string name = kNames[input_.Byte() % std::size(kNames)];
    const int sequence = input_.Byte();
    return AsciiLog(name, input_.Text(), sequence);
  }

  ScriptedConnection& connection_;
  Input input_;
};

}  // namespace fuzz

#endif  // RCVLINK_TESTS_FUZZ_VELMAR_SCRIPT_H_
