#include "tests/host/support/receiver.h"

#include <chrono>
#include <thread>

namespace host {
namespace {

// The last command of the handshake, as in the transcript.
constexpr const char* kEndOfGreeting = " echo /dev/null\n";

constexpr auto kPatience = std::chrono::seconds(20);
constexpr auto kPollInterval = std::chrono::milliseconds(5);

std::wstring TakeText(wchar_t* text) {
  std::wstring copy = text == nullptr ? L"" : text;
  SysFreeString(text);
  return copy;
}

}  // namespace

std::string Narrow(const std::wstring& text) {
  std::string narrow;
  for (const wchar_t character : text) narrow += static_cast<char>(character);
  return narrow;
}

DCB Settings(DWORD speed) {
  DCB settings{};
  settings.DCBlength = sizeof(DCB);
  settings.BaudRate = speed;
  settings.fBinary = TRUE;
  settings.ByteSize = 8;
  settings.Parity = NOPARITY;
  settings.StopBits = ONESTOPBIT;
  return settings;
}

Receiver::Receiver(const bed::SimulatedPort& port, DWORD speed) : port_(port) {
  std::wstring name = port.name();
  DCB settings = Settings(speed);
  const long result =
      devapi::CreateReceiverOnSerial(name.data(), eProtocolQuorin, &settings, nullptr, out());
  if (result != S_OK) {
    throw bed::Error("no receiver answers, " + std::to_string(result) + ":\n" + port.Transcript());
  }
  port.WaitForTranscript(kEndOfGreeting);
  greeting_ = WireLines(port.Transcript()).size();
}

UsbReceiver::UsbReceiver(const bed::SimulatedUsb& usb) : usb_(usb) {
  std::wstring device = usb.device();
  const long result = devapi::CreateReceiverOnUSB(device.data(), eProtocolQuorin, nullptr, out());
  if (result != S_OK) {
    throw bed::Error("no receiver answers, " + std::to_string(result) + ":\n" + usb.Transcript());
  }
  usb.WaitForTranscript(kEndOfGreeting);
  greeting_ = WireLines(usb.Transcript()).size();
}

OpenReceiver::~OpenReceiver() {
  if (handle_ != nullptr) devapi::CloseReceiver(handle_);
}

void Receiver::WaitForSent(size_t count) const {
  WaitUntil([count](const Lines& sent) { return sent.size() >= count; });
}

void Receiver::WaitForLastSent(std::string_view line) const {
  WaitUntil([line](const Lines& sent) { return !sent.empty() && sent.back() == line; });
}

void Receiver::WaitUntil(const std::function<bool(const Lines& sent)>& done) const {
  const auto end = std::chrono::steady_clock::now() + kPatience;
  while (!done(SentSince())) {
    if (std::chrono::steady_clock::now() > end) {
      throw bed::Error("the host has not sent that:\n" + port_.Transcript());
    }
    std::this_thread::sleep_for(kPollInterval);
  }
}

HRESULT OpenReceiver::Download(const std::wstring& name,
                               IStream& stream,
                               Progress* progress) const {
  std::wstring file = name;
  return devapi::DownloadFile(
      handle_, file.data(), &stream, progress == nullptr ? nullptr : progress->record());
}

Identity OpenReceiver::Identify() const {
  CReceiverInfo info{};
  Identity identity;
  identity.result = devapi::GetReceiverInfo(handle_, nullptr, &info);
  // A failed call leaves the receiver locked.
  if (identity.result != S_OK) devapi::UnlockConnection(handle_);
  identity.id = TakeText(info.bstrReceiverId);
  identity.model = TakeText(info.bstrModel);
  return identity;
}

long OpenReceiver::Check() const {
  short answer = 7;
  const long result = devapi::CheckConnection(handle_, nullptr, &answer);
  return result == S_OK ? answer : result;
}

}  // namespace host
