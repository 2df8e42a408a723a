// One Velmar command and whatever is answered.
#include "tests/fuzz/velmar_script.h"
#include "tests/support/manual_clock.h"
#include "velmar/commands.h"

namespace {

class Chunks : public VelmarCommands::CReadFileCmdCallback {
 public:
  HRESULT OnDataReceived(void*) override { return S_OK; }
};

}  // namespace

void fuzz::Target(std::span<const uint8_t> bytes) {
  using namespace VelmarCommands;
  ManualClock clock;
  Input input(bytes);
  const uint8_t kind = input.Byte();
  ScriptedConnection connection;
  const VelmarScript receiver(connection, input);
  Chunks chunks;
  switch (kind % 6) {
    case 0:
      CGetReceiverInfoCmd().Execute(&connection, nullptr);
      break;
    case 1:
      CGetFileListCmd().Execute(&connection, nullptr);
      break;
    case 2:
      CGetFileHeaderCmd().Execute(&connection, nullptr);
      break;
    case 3:
      CLogConfigCommand().Execute(&connection, nullptr);
      break;
    case 4:
      CReadFileCmd(&chunks, nullptr).Execute(&connection, nullptr);
      break;
    default:
      CSetCurrentFileCmd("A.LOG").Execute(&connection, nullptr);
  }
}
