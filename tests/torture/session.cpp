#include "tests/torture/session.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <functional>
#include <optional>
#include <span>
#include <string_view>
#include <utility>

#include "platform/text.h"
#include "simulator/files.h"
#include "simulator/quorin/receiver.h"
#include "simulator/velmar/receiver.h"
#include "tests/support/allocations.h"
#include "tests/support/content.h"
#include "tests/support/simulated_com_port.h"
#include "tests/transport/descriptor_bytes.h"
#include "transport/usbio.h"

using rcvlink::UniqueBstr;

namespace torture {
namespace {

constexpr size_t kFileSize = 1500;  // three Quorin blocks, two Velmar chunks
constexpr std::array<const wchar_t*, Bench::kFiles> kFileNames = {L"A.LOG", L"B.LOG", L"C.LOG"};
wchar_t port_name[] = L"COM7";
wchar_t device_name[] = L"\\\\?\\device";

sim::FileStore Files() {
  const std::string content = Bench::FileContent();
  const sim::Bytes bytes(content.begin(), content.end());
  sim::FileStore files;
  for (const wchar_t* name : kFileNames) files.Add(rcvlink::ToNarrow(name), bytes, 1'700'000'000);
  return files;
}

// `served` gets the files of the receiver.
template <typename Receiver, typename Options>
std::unique_ptr<sim::Receiver> Make(const Options& options,
                                    sim::FileStore files,
                                    const sim::FileStore** served) {
  auto receiver = std::make_unique<Receiver>(options, std::move(files));
  *served = &receiver->files();
  return receiver;
}

std::unique_ptr<sim::Receiver> MakeReceiver(const Link& link,
                                            sim::FileStore files,
                                            const sim::FileStore** served) {
  if (link.family == eProtocolVelmar) {
    return Make<sim::VelmarReceiver>(
        sim::VelmarOptions{.line = {.speed = link.speed}}, std::move(files), served);
  }
  return Make<sim::QuorinReceiver>(
      sim::QuorinOptions{.line = {.speed = link.speed}}, std::move(files), served);
}

bool IsOneOfTheFiles(const CFileInfo& file) {
  return file.bstrName && file.dwSize == kFileSize &&
         std::ranges::any_of(kFileNames, [&](const wchar_t* name) {
           return std::wstring_view(file.bstrName) == name;
         });
}

template <typename Identity>
bool IsOf(const CReceiverInfo& info, const Identity& identity) {
  return info.bstrReceiverId && info.bstrModel &&
         rcvlink::ToNarrow(info.bstrReceiverId) == identity.id &&
         rcvlink::ToNarrow(info.bstrModel) == identity.model;
}

bool IsOf(const CReceiverInfo& info, const Link& link) {
  const UncountedAllocations own;
  return link.family == eProtocolVelmar ? IsOf(info, sim::VelmarIdentity{})
                                        : IsOf(info, sim::QuorinIdentity{});
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
  bool is_pending = false;            // whether writes and requests are, at first

  Port(sim::Receiver& receiver, ManualClock& clock, EInstanceType instance)
      : SimulatedComPort(receiver, clock) {
    is_usb = instance == eInstanceUSB;
    if (is_usb) path = device_name;
    if (!is_usb) state.BaudRate = CBR_9600;
  }

  DWORD WaitForMultipleObjects(DWORD count, const HANDLE* handles, DWORD timeout_ms) override {
    if (before_wait) before_wait();
    if (pending_.block && handles[count - 1] == pending_.event) return WAIT_OBJECT_0 + count - 1;
    return SimulatedComPort::WaitForMultipleObjects(count, handles, timeout_ms);
  }

  BOOL WriteFile(
      HANDLE device, const void* buffer, DWORD size, DWORD* written, OVERLAPPED* block) override {
    SimulatedComPort::WriteFile(device, buffer, size, written, block);
    return End(*written, written, block);
  }

  BOOL DeviceIoControl(HANDLE,
                       DWORD code,
                       void*,
                       DWORD,
                       void* output,
                       DWORD output_size,
                       DWORD* returned,
                       OVERLAPPED* block) override {
    if (code != usbio::kGetDescriptor) return End(0, returned, block);
    const std::string descriptors =
        DeviceBytes({EndpointBytes(0x02, kBulk), EndpointBytes(0x83, kBulk)});
    const DWORD count = std::min(output_size, static_cast<DWORD>(descriptors.size()));
    std::copy_n(descriptors.begin(), count, static_cast<char*>(output));
    return End(count, returned, block);
  }

  BOOL GetOverlappedResult(HANDLE device, OVERLAPPED* block, DWORD* bytes) override {
    if (block != pending_.block) return SimulatedComPort::GetOverlappedResult(device, block, bytes);
    *bytes = std::exchange(pending_, {}).bytes;
    return TRUE;
  }

  BOOL CancelIo(HANDLE device) override {
    pending_ = {};
    return SimulatedComPort::CancelIo(device);
  }

 private:
  // Of a write or request of so many bytes.
  BOOL End(DWORD bytes, DWORD* count, OVERLAPPED* block) {
    *count = is_pending ? 0 : bytes;
    if (!is_pending) return TRUE;
    pending_ = {block, block->hEvent, bytes};
    SetLastError(ERROR_IO_PENDING);
    return FALSE;
  }

  // The one that is pending.
  struct Pending {
    OVERLAPPED* block = nullptr;
    HANDLE event = nullptr;
    DWORD bytes = 0;
  };
  Pending pending_;
};

Bench::Bench(const Link& link) : Bench(link, Files()) {}

Bench::Bench(const Link& link, sim::FileStore files)
    : receiver_(MakeReceiver(link, std::move(files), &files_)),
      line_(std::make_unique<Line>(*receiver_)),
      port_(std::make_unique<Port>(*line_, clock_, link.instance)),
      faulty_(*port_) {}

Bench::~Bench() = default;

long Bench::CountFiles() const { return static_cast<long>(files_->List().size()); }

bool Bench::HasFile(const std::string& name) const { return files_->Find(name).has_value(); }

bool Bench::IsInTune() const {
  return port_->is_usb || receiver_->speed() == port_->state.BaudRate;
}

void Bench::Damage(const sim::DamageOptions& options) { line_->Damage(options); }

void Bench::MakePending() { port_->is_pending = true; }

void Bench::AbortAfter(void* receiver, DWORD milliseconds) {
  port_->before_wait = [this, receiver, end = clock_.now + milliseconds] {
    if (clock_.now < end) return;
    has_aborted_ = true;
    devapi::Abort(receiver);
  };
}

Found::Found(const Link& link) {
  devapi::SearchReceiver(link.port(), link.instance, eProtocolAny, nullptr, &handle_);
}

std::string Bench::FileContent() { return Content(kFileSize); }

Listing Listing::Of(void* receiver) {
  Listing listing;
  void* files = nullptr;
  listing.result = devapi::OpenFileList(receiver, &files);
  if (!files) return listing;
  devapi::GetFilesCount(files, &listing.count);
  for (long i = 0; i < listing.count; ++i) {
    CFileInfo file{};
    const long result = devapi::GetFileInfo(files, i, &file);
    if (FAILED(result)) listing.result = result;
    listing.are_files = listing.are_files && IsOneOfTheFiles(file);
    SysFreeString(file.bstrName);
  }
  devapi::CloseFileList(files);
  return listing;
}

void Session::Run(const Link& link, IStream* stream, bool removes, const Watch* watch) {
  void* receiver = nullptr;
  search = devapi::SearchReceiver(link.port(), link.instance, eProtocolAny, nullptr, &receiver);
  if (!receiver) return;
  CheckAfter("search", receiver, watch);

  CReceiverInfo identity{};
  info = devapi::GetReceiverInfo(receiver, nullptr, &identity);
  const UniqueBstr id(identity.bstrReceiverId);
  const UniqueBstr model(identity.bstrModel);
  has_texts = IsOf(identity, link);
  // Only this one leaves the lock to the host when it fails.
  const bool is_left_locked = info != S_OK && link.family == eProtocolQuorin;
  if (watch) CheckLock("info", receiver, is_left_locked ? S_FALSE : S_OK, *watch);
  if (is_left_locked) devapi::UnlockConnection(receiver);
  CheckAfter("info", receiver, watch);

  list = Listing::Of(receiver);
  CheckAfter("list", receiver, watch);

  wchar_t wanted[] = L"A.LOG";
  download = devapi::DownloadFile(receiver, wanted, stream, nullptr);
  CheckAfter("download", receiver, watch);

  wchar_t unwanted[] = L"B.LOG";
  if (removes) remove = devapi::DeleteFileW(receiver, unwanted);
  CheckAfter("delete", receiver, watch);

  close = devapi::CloseReceiver(receiver);
}

void Session::CheckLock(std::string_view operation,
                        void* receiver,
                        long expected,
                        const Watch& watch) {
  if (wrong_lock.empty() && watch.locks.Try(receiver) != expected) wrong_lock = operation;
}

void Session::CheckAfter(std::string_view operation, void* receiver, const Watch* watch) {
  if (!watch) return;
  CheckLock(operation, receiver, S_OK, *watch);
  if (!failed_in.empty() || !watch->has_failed()) return;
  failed_in = operation;
  next = Listing::Of(receiver);
  CheckLock("the list after it", receiver, S_OK, *watch);
}

bool Session::IsWhole(const std::string& bytes) const {
  return search == S_OK && info == S_OK && has_texts && list.result == S_OK && list.are_files &&
         list.count >= Bench::kFiles - 1 && download == S_OK &&
         (remove == S_OK || remove == kNotCalled) && close == S_OK && bytes == Bench::FileContent();
}

std::string Session::InWords() const {
  char text[240] = {};
  std::snprintf(text,
                sizeof(text),
                "search %08lX, info %08lX, list %08lX of %ld, download %08lX, delete %08lX, "
                "close %08lX; after the %s: list %08lX of %ld",
                search,
                info,
                list.result,
                list.count,
                download,
                remove,
                close,
                failed_in.empty() ? "end" : failed_in.data(),
                next.result,
                next.count);
  return text;
}

}  // namespace torture
