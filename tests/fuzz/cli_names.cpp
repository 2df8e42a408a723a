// Names of ports and files in the program.
#include "cli/names.h"
#include "cli/text.h"
#include "cli/wildcard.h"
#include "tests/fuzz/target.h"

void fuzz::Target(std::span<const uint8_t> bytes) {
  Input input(bytes);
  std::wstring name;
  for (uint8_t left = input.Byte(); left > 0 && !input.AtEnd(); --left) {
    name += static_cast<wchar_t>(input.Word());
  }
  const std::string text = input.Rest();

  cli::Printable(name);
  cli::WhyNotSendable(name);
  cli::LooksLikePort(cli::PlainPortName(name));
  if (const auto local = cli::SafeLocalName(name)) {
    if (local->find_first_of(L"\\/:") != std::wstring::npos) std::abort();
    if (!cli::IsPlainFileName(*local)) std::abort();
  }
  const std::wstring wide = cli::ToUtf16(text);
  cli::ToUtf8(wide);
  cli::FitsPattern(name, wide);
}
