#include "simulator/ports/driver_service.h"

#include <chrono>
#include <string>
#include <system_error>
#include <thread>
#include <vector>

#include "simulator/usb/driver/bus.h"

namespace sim {
namespace {

constexpr wchar_t kStartMutex[] = L"rcvlink-usb-bus-start";
constexpr auto kStartTimeout = std::chrono::seconds(30);
constexpr auto kRetryInterval = std::chrono::milliseconds(20);
constexpr DWORD kServiceAccess = SERVICE_START | SERVICE_CHANGE_CONFIG | SERVICE_QUERY_STATUS;

[[noreturn]] void Throw(DWORD error, const char* what) {
  throw std::system_error(static_cast<int>(error), std::system_category(), what);
}

struct ServiceCloser {
  using pointer = SC_HANDLE;
  void operator()(SC_HANDLE handle) const { CloseServiceHandle(handle); }
};
using UniqueService = std::unique_ptr<SC_HANDLE, ServiceCloser>;

// Makes other programs that want to start the driver wait.
class StartLock {
 public:
  StartLock() : mutex_(CreateMutexW(nullptr, FALSE, kStartMutex)) {
    if (mutex_.get() == nullptr) {
      Throw(GetLastError(), "cannot make a mutex");
    }
    // It does not matter if the last holder died: whatever it left half done is done again.
    WaitForSingleObject(mutex_.get(), INFINITE);
  }
  StartLock(const StartLock&) = delete;
  StartLock& operator=(const StartLock&) = delete;
  ~StartLock() { ReleaseMutex(mutex_.get()); }

 private:
  UniqueHandle mutex_;
};

std::wstring DriverPath() {
  std::vector<wchar_t> path(MAX_PATH);
  DWORD length = 0;
  while ((length = GetModuleFileNameW(nullptr, path.data(), static_cast<DWORD>(path.size()))) ==
         path.size()) {
    path.resize(2 * path.size());
  }
  const std::wstring program(path.data(), length);
  return program.substr(0, program.rfind(L'\\') + 1) + usb_bus::kDriverFile;
}

UniqueHandle TryToOpenBus() {
  return UniqueHandle(CreateFileW(usb_bus::kBusPath,
                                  GENERIC_READ | GENERIC_WRITE,
                                  0,
                                  nullptr,
                                  OPEN_EXISTING,
                                  FILE_FLAG_OVERLAPPED,
                                  nullptr));
}

bool IsOpen(const UniqueHandle& bus) { return bus.get() != INVALID_HANDLE_VALUE; }

UniqueService InstallService() {
  const std::wstring path = DriverPath();
  const UniqueService manager(OpenSCManagerW(nullptr, nullptr, SC_MANAGER_ALL_ACCESS));
  if (!manager) {
    Throw(GetLastError(), "cannot reach the service manager");
  }
  UniqueService service(CreateServiceW(manager.get(),
                                       usb_bus::kServiceName,
                                       usb_bus::kServiceName,
                                       kServiceAccess,
                                       SERVICE_KERNEL_DRIVER,
                                       SERVICE_DEMAND_START,
                                       SERVICE_ERROR_NORMAL,
                                       path.c_str(),
                                       nullptr,
                                       nullptr,
                                       nullptr,
                                       nullptr,
                                       nullptr));
  if (service) {
    return service;
  }
  if (GetLastError() != ERROR_SERVICE_EXISTS) {
    Throw(GetLastError(), "cannot install the USB bus driver");
  }
  service.reset(OpenServiceW(manager.get(), usb_bus::kServiceName, kServiceAccess));
  if (!service) {
    Throw(GetLastError(), "cannot open the USB bus driver's service");
  }
  // The service may name the driver of another build.
  ChangeServiceConfigW(service.get(),
                       SERVICE_NO_CHANGE,
                       SERVICE_NO_CHANGE,
                       SERVICE_NO_CHANGE,
                       path.c_str(),
                       nullptr,
                       nullptr,
                       nullptr,
                       nullptr,
                       nullptr,
                       nullptr);
  return service;
}

// Errors that go away: the service manager is busy, or the driver is starting or stopping.
bool MayPass(DWORD error) {
  return error == ERROR_SERVICE_ALREADY_RUNNING || error == ERROR_SERVICE_DATABASE_LOCKED ||
         error == ERROR_SERVICE_CANNOT_ACCEPT_CTRL || error == ERROR_SERVICE_REQUEST_TIMEOUT;
}

}  // namespace

UniqueHandle OpenUsbBus() {
  if (UniqueHandle bus = TryToOpenBus(); IsOpen(bus)) {
    return bus;
  }
  const StartLock lock;
  const UniqueService service = InstallService();
  const auto end = std::chrono::steady_clock::now() + kStartTimeout;
  for (;;) {
    const DWORD error = StartServiceW(service.get(), 0, nullptr) ? ERROR_SUCCESS : GetLastError();
    if (UniqueHandle bus = TryToOpenBus(); IsOpen(bus)) {
      return bus;
    }
    const bool passing = error == ERROR_SUCCESS || MayPass(error);
    if (!passing || std::chrono::steady_clock::now() > end) {
      Throw(error, "the USB bus driver does not start");
    }
    std::this_thread::sleep_for(kRetryInterval);
  }
}

}  // namespace sim
