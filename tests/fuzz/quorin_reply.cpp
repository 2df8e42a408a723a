// One Quorin command and whatever is answered.
#include "quorin/commands.h"
#include "tests/fuzz/quorin_script.h"

namespace {

constexpr uint32_t kFlags = QuorinCommands::kTagged;

template <typename Command>
void Execute(ScriptedConnection& connection, Command&& command) {
  command.Execute(&connection, nullptr);
  if constexpr (requires { command.Text(); }) command.Text();
  if constexpr (requires { command.PortIndex(); }) command.PortIndex();
  if constexpr (requires { command.Size(); }) command.Size();
  if constexpr (requires { command.Entries(); }) command.Entries();
}

}  // namespace

void fuzz::Target(std::span<const uint8_t> bytes) {
  using namespace QuorinCommands;
  Input input(bytes);
  const uint8_t kind = input.Byte();
  ScriptedConnection connection;
  const QuorinScript receiver(connection, input);
  switch (kind % 7) {
    case 0:
      return Execute(connection, CPingCmd(kFlags));
    case 1:
      return Execute(connection, CGetPortCmd(kFlags));
    case 2:
      return Execute(connection, CGetFileSizeCmd("A.LOG", kFlags));
    case 3:
      return Execute(connection, CGetReceiverIDCmd(kFlags));
    case 4:
      return Execute(connection, CGetFileListCmd(kFlags));
    case 5:
      return Execute(connection, CGetReceiverModelCmd(0));
    default:
      return Execute(connection, CGetFileListCmd(0));
  }
}
