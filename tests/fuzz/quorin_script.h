// A Quorin receiver that answers what the input says. The input is a list of steps; each is a byte for its kind
// and the step's own bytes. Each line and each control byte of the host takes one step, and the next ones as long
// as the kind has kMore. Tags, lengths and checksums are made here, so that the fuzzer gets past them.
#ifndef RCVLINK_TESTS_FUZZ_QUORIN_SCRIPT_H_
#define RCVLINK_TESTS_FUZZ_QUORIN_SCRIPT_H_

#include "platform/hresult.h"
#include "tests/fuzz/target.h"
#include "tests/quorin/quorin_responder.h"
#include "tests/support/block_stream.h"
#include "tests/support/scripted_connection.h"

namespace fuzz {

class QuorinScript {
 public:
  QuorinScript(ScriptedConnection& connection, Input input)
      : connection_(connection), input_(input) {
    connection.on_write = [this](std::string_view bytes) { return Hear(std::string(bytes)); };
  }
  QuorinScript(const QuorinScript&) = delete;
  QuorinScript& operator=(const QuorinScript&) = delete;

 private:
  static constexpr uint8_t kMore = 0x80;
  static constexpr uint8_t kKinds = 8;

  HRESULT Hear(const std::string& bytes) {
    if (IsTag(bytes)) {
      tag_ = bytes;
      return S_OK;
    }
    bool more = true;
    while (more && !input_.AtEnd()) {
      const uint8_t kind = input_.Byte();
      more = (kind & kMore) != 0;
      if (const HRESULT result = Take(kind % kKinds); FAILED(result)) return result;
    }
    return S_OK;
  }

  HRESULT Take(uint8_t kind) {
    switch (kind) {
      case 0:
        connection_.GiveRead(input_.Text());
        break;
      case 1:
        connection_.GiveRead(Message("RE", tag_ + input_.Text()));
        break;
      case 2:
        connection_.GiveRead(Message("ER", tag_ + input_.Text()));
        break;
      case 3:
        connection_.GiveRead(Message("RE", input_.Text()));
        break;
      case 4:
        connection_.GiveResult(rcvlink::kTimedOut);
        break;
      case 5:
        connection_.GiveResult(rcvlink::HResultFromError(input_.Word()));
        break;
      case 6: {
        const uint16_t field = input_.Word();
        const uint8_t type = input_.Byte();
        connection_.GiveRead(blocks_.Next(type, field, input_.Text()));
        break;
      }
      default:  // the write fails
        return rcvlink::HResultFromError(input_.Word());
    }
    return S_OK;
  }

  ScriptedConnection& connection_;
  Input input_;
  std::string tag_;
  BlockStream blocks_;
};

}  // namespace fuzz

#endif  // RCVLINK_TESTS_FUZZ_QUORIN_SCRIPT_H_
