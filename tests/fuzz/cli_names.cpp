// Names of ports and files in the program.
#include "cli/formats.h"
#include "cli/mirror_plan.h"
#include "cli/names.h"
#include "cli/port_list.h"
#include "cli/text.h"
#include "cli/wildcard.h"
#include "tests/fuzz/target.h"

namespace {

// What Windows says of its ports: each name is a port, a device's path and a friendly name.
class Ports : public cli::PortSource {
 public:
  explicit Ports(std::vector<std::wstring> names) : names_(std::move(names)) {}

  std::vector<std::wstring> RegisteredPorts() const override { return names_; }
  std::vector<std::wstring> DeviceNames() const override { return names_; }
  std::vector<NamedPort> NamedPorts() const override {
    std::vector<NamedPort> ports;
    for (const std::wstring& name : names_) ports.push_back({name, names_.front()});
    return ports;
  }
  std::vector<UsbInterface> UsbInterfaces() const override {
    std::vector<UsbInterface> devices;
    for (const std::wstring& name : names_) devices.push_back({name, L"USBIO", names_.back()});
    return devices;
  }

 private:
  std::vector<std::wstring> names_;
};

void ShowProgress(const std::wstring& name, uint64_t done, uint64_t total) {
  constexpr size_t kWidth = 80;
  const cli::TransferState state{.name = name, .done = done, .total = total, .rate = done};
  if (cli::ToUtf16(cli::ProgressBar(state, kWidth)).size() > kWidth) std::abort();
  cli::ProgressLine(state);
  cli::ProgressJson(state);
  const cli::MirrorState mirror{
      .file = 1, .files = 2, .done = done, .total = total, .elapsed_ms = total};
  cli::InWords(mirror, name, total);
}

}  // namespace

void fuzz::Target(std::span<const uint8_t> bytes) {
  Input input(bytes);
  std::wstring name;
  for (uint8_t left = input.Byte(); left > 0 && !input.AtEnd(); --left) {
    name += static_cast<wchar_t>(input.Word());
  }
  const std::string text = input.Rest();

  if (std::ranges::any_of(cli::ToUtf16(cli::Printable(name)), cli::IsControl)) std::abort();
  cli::WhyNotSendable(name);
  cli::LooksLikePort(cli::PlainPortName(name));
  if (const auto local = cli::SafeLocalName(name)) {
    if (local->find_first_of(L"\\/:") != std::wstring::npos) std::abort();
    if (!cli::IsPlainFileName(*local)) std::abort();
  }
  const std::wstring wide = cli::ToUtf16(text);
  cli::ToUtf8(wide);
  cli::FitsPattern(name, wide);
  cli::PortsInWords(cli::ListPorts(Ports({name, wide})), eInstanceAny);
  ShowProgress(name, text.size(), name.size());
  ShowProgress(wide, name.size(), text.size());
}
