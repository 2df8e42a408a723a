#include "tests/torture/session.h"

#include <algorithm>
#include <cstdio>
#include <functional>
#include <optional>
#include <span>
#include <utility>

#include "platform/text.h"
#include "simulator/files.h"
#include "simulator/quorin/receiver.h"
#include "simulator/velmar/receiver.h"
#include "tests/support/content.h"
#include "tests/support/simulated_com_port.h"
#include "tests/transport/descriptor_bytes.h"
#include "transport/usbio.h"

using rcvlink::UniqueBstr;

namespace torture {
namespace {

constexpr size_t kFileSize = 1500;  // three Quorin blocks, two Velmar chunks
wchar_t port_name[] = L"COM7";
wchar_t device_name[] = L"\\\\?\\device";

sim::FileStore Files() {
  const std::string content = Bench::FileContent();
  const sim::Bytes bytes(content.begin(), content.end());
  sim::FileStore files;
  for (const char* name : {"A.LOG", "B.LOG", "C.LOG"}) files.Add(name, bytes, 1'700'000'000);
  return files;
}

std::unique_ptr<sim::Receiver> MakeReceiver(const Link& link, sim::FileStore files) {
  if (link.family == eProtocolVelmar) {
    return std::make_unique<sim::VelmarReceiver>(sim::VelmarOptions{}, std::move(files));
  }
  return std::make_unique<sim::QuorinReceiver>(sim::QuorinOptions{}, std::move(files));
}

}  // namespace

wchar_t* Link::port() const { return instance == eInstanceUSB ? device_name : port_name; }

// The line to the receiver. It is good until Damage is called.
class Bench::Line : public sim::Receiver {
 public:
  explicit Line(sim::Receiver& receiver) : end_(&receiver) {}

  void Damage(const sim::DamageOptions& options) {
    damaged_.emplace(options, *end_);
    end_ = &*damaged_;
  }

  void Receive(std::span<const uint8_t> bytes, uint32_t host_speed, uint64_t now_ms) override {
    end_->Receive(bytes, host_speed, now_ms);
  }
  std::optional<uint64_t> NextSendTime() const override { return end_->NextSendTime(); }
  sim::Bytes Send(uint64_t now_ms, uint32_t host_speed) override {
    return end_->Send(now_ms, host_speed);
  }
  bool gone() const override { return end_->gone(); }
  uint32_t speed() const override { return end_->speed(); }
  std::optional<uint64_t> last_block() const override { return end_->last_block(); }

 private:
  sim::Receiver* end_;
  std::optional<sim::DamagedLine> damaged_;
};

// A COM port, or a USB device with the usual two endpoints.
class Bench::Port : public SimulatedComPort {
 public:
  std::function<void()> before_wait;  // may be empty

  DWORD WaitForMultipleObjects(DWORD count, const HANDLE* handles, DWORD timeout_ms) override {
    if (before_wait) before_wait();
    return SimulatedComPort::WaitForMultipleObjects(count, handles, timeout_ms);
  }

  Port(sim::Receiver& receiver, ManualClock& clock, EInstanceType instance)
      : SimulatedComPort(receiver, clock) {
    is_usb = instance == eInstanceUSB;
    if (is_usb) path = device_name;
    if (!is_usb) state.BaudRate = CBR_9600;
  }

  BOOL DeviceIoControl(HANDLE,
                       DWORD code,
                       void*,
                       DWORD,
                       void* output,
                       DWORD output_size,
                       DWORD* returned,
                       OVERLAPPED*) override {
    if (code != usbio::kGetDescriptor) return TRUE;
    const std::string descriptors =
        DeviceBytes({EndpointBytes(0x02, kBulk), EndpointBytes(0x83, kBulk)});
    *returned = std::min(output_size, static_cast<DWORD>(descriptors.size()));
    std::copy_n(descriptors.begin(), *returned, static_cast<char*>(output));
    return TRUE;
  }
};

Bench::Bench(const Link& link) : Bench(link, Files()) {}

Bench::Bench(const Link& link, sim::FileStore files)
    : receiver_(MakeReceiver(link, std::move(files))),
      line_(std::make_unique<Line>(*receiver_)),
      port_(std::make_unique<Port>(*line_, clock_, link.instance)),
      faulty_(*port_) {}

Bench::~Bench() = default;

void Bench::Damage(const sim::DamageOptions& options) { line_->Damage(options); }

void Bench::AbortAfter(void* receiver, DWORD milliseconds) {
  port_->before_wait = [this, receiver, end = clock_.now + milliseconds] {
    if (clock_.now >= end) devapi::Abort(receiver);
  };
}

Found::Found(const Link& link) {
  devapi::SearchReceiver(link.port(), link.instance, eProtocolAny, nullptr, &handle_);
}

std::string Bench::FileContent() { return Content(kFileSize); }

void Session::Run(const Link& link, IStream* stream, bool removes) {
  void* receiver = nullptr;
  search = devapi::SearchReceiver(link.port(), link.instance, eProtocolAny, nullptr, &receiver);
  if (!receiver) return;

  CReceiverInfo identity{};
  info = devapi::GetReceiverInfo(receiver, nullptr, &identity);
  const UniqueBstr id(identity.bstrReceiverId);
  const UniqueBstr model(identity.bstrModel);
  if (info != S_OK) devapi::UnlockConnection(receiver);

  void* files = nullptr;
  list = devapi::OpenFileList(receiver, &files);
  if (files) {
    devapi::GetFilesCount(files, &count);
    for (long i = 0; i < count; ++i) {
      CFileInfo file{};
      devapi::GetFileInfo(files, i, &file);
      SysFreeString(file.bstrName);
    }
    devapi::CloseFileList(files);
  }

  wchar_t wanted[] = L"A.LOG";
  download = devapi::DownloadFile(receiver, wanted, stream, nullptr);
  wchar_t unwanted[] = L"B.LOG";
  if (removes) remove = devapi::DeleteFileW(receiver, unwanted);
  close = devapi::CloseReceiver(receiver);
}

bool Session::IsWhole(const std::string& bytes) const {
  return search == S_OK && info == S_OK && list == S_OK && count >= Bench::kFiles - 1 &&
         download == S_OK && (remove == S_OK || remove == kNotCalled) && close == S_OK &&
         bytes == Bench::FileContent();
}

std::string Session::InWords() const {
  char text[160] = {};
  std::snprintf(text,
                sizeof(text),
                "search %08lX, info %08lX, list %08lX of %ld, download %08lX, delete %08lX, "
                "close %08lX",
                search,
                info,
                list,
                count,
                download,
                remove,
                close);
  return text;
}

}  // namespace torture
