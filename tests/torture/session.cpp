#include "tests/torture/session.h"

#include <algorithm>
#include <cstdio>
#include <utility>

#include "platform/text.h"
#include "simulator/files.h"
#include "simulator/quorin/receiver.h"
#include "simulator/velmar/receiver.h"
#include "tests/support/content.h"
#include "tests/transport/descriptor_bytes.h"
#include "transport/usbio.h"

using rcvlink::UniqueBstr;

namespace torture {
namespace {

constexpr long kFiles = 3;
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

// A COM port, or a USB device with the usual two endpoints.
class Bench::Port : public SimulatedComPort {
 public:
  Port(sim::Receiver& receiver, ManualClock& clock, EInstanceType instance)
      : SimulatedComPort(receiver, clock) {
    is_usb = instance == eInstanceUSB;
    if (is_usb) path = device_name;
    if (!is_usb) state.BaudRate = CBR_9600;
  }

  BOOL DeviceIoControl(HANDLE,
                       DWORD code,
                       const void*,
                       DWORD,
                       void* output,
                       DWORD output_size,
                       DWORD* returned) override {
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
      port_(std::make_unique<Port>(*receiver_, clock_, link.instance)),
      faulty_(*port_) {}

std::string Bench::FileContent() { return Content(kFileSize); }

void Session::Run(const Link& link, IStream* stream, bool removes) {
  wchar_t* const name = link.instance == eInstanceUSB ? device_name : port_name;
  void* receiver = nullptr;
  search = devapi::SearchReceiver(name, link.instance, eProtocolAny, nullptr, &receiver);
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
  return search == S_OK && info == S_OK && list == S_OK && count >= kFiles - 1 &&
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
