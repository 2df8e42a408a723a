#include "commands.h"

#include <array>

namespace cli {

using CommandPointer = std::unique_ptr<Command>;

// Each is in the file of its name.
CommandPointer MakePorts();
CommandPointer MakeFind();
CommandPointer MakeInfo();
CommandPointer MakeList();
CommandPointer MakeGet();
CommandPointer MakeMirror();
CommandPointer MakeRemove();
CommandPointer MakeMove();
CommandPointer MakeSet();
CommandPointer MakeCheck();
CommandPointer MakeExplain();
CommandPointer MakeReport();
CommandPointer MakeCompletion();

Commands MakeCommands() {
  constexpr std::array kTable = {MakePorts,
                                 MakeFind,
                                 MakeInfo,
                                 MakeList,
                                 MakeGet,
                                 MakeMirror,
                                 MakeRemove,
                                 MakeMove,
                                 MakeSet,
                                 MakeCheck,
                                 MakeExplain,
                                 MakeReport,
                                 MakeCompletion};
  Commands commands;
  for (const auto make : kTable) commands.push_back(make());
  return commands;
}

}  // namespace cli
