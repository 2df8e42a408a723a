// The calls of a serial port, and those of a driver, as Windows has them. Here each only has to reach Windows, which
// knows that the handle is no device's. That it is the right one, and what it does, the tests of the DLL show.
#include "transport/device_calls.h"

#include <gtest/gtest.h>

#include <functional>
#include <ostream>
#include <string>

#include "platform/handle.h"

using rcvlink::DeviceCalls;
using rcvlink::KernelHandle;

namespace {

struct Call {
  std::string name;
  std::function<BOOL(HANDLE device)> run;
};

std::ostream& operator<<(std::ostream& stream, const Call& call) { return stream << call.name; }

DeviceCalls& Calls() { return rcvlink::SystemCalls(); }

class SystemCall : public testing::TestWithParam<Call> {};

TEST_P(SystemCall, FailsOnAHandleThatIsNoDevices) {
  const KernelHandle event(CreateEventW(nullptr, TRUE, FALSE, nullptr));
  SetLastError(ERROR_SUCCESS);
  EXPECT_FALSE(GetParam().run(event.get()));
  EXPECT_NE(GetLastError(), static_cast<DWORD>(ERROR_SUCCESS));
}

INSTANTIATE_TEST_SUITE_P(
    All,
    SystemCall,
    testing::Values(
        Call{"DeviceIoControl",
             [](HANDLE device) {
               DWORD returned = 0;
               return Calls().DeviceIoControl(
                   device, 0, nullptr, 0, nullptr, 0, &returned, nullptr);
             }},
        Call{"SetCommMask", [](HANDLE device) { return Calls().SetCommMask(device, EV_ERR); }},
        Call{"SetupComm", [](HANDLE device) { return Calls().SetupComm(device, 4096, 4096); }},
        Call{"GetCommState",
             [](HANDLE device) {
               DCB settings{};
               return Calls().GetCommState(device, &settings);
             }},
        Call{"SetCommState",
             [](HANDLE device) {
               DCB settings{};
               settings.DCBlength = sizeof(settings);
               return Calls().SetCommState(device, &settings);
             }},
        Call{"SetCommTimeouts",
             [](HANDLE device) {
               COMMTIMEOUTS timeouts{};
               return Calls().SetCommTimeouts(device, &timeouts);
             }},
        Call{"ClearCommError",
             [](HANDLE device) {
               DWORD errors = 0;
               COMSTAT status{};
               return Calls().ClearCommError(device, &errors, &status);
             }},
        Call{"PurgeComm", [](HANDLE device) { return Calls().PurgeComm(device, PURGE_RXCLEAR); }}),
    [](const auto& info) { return info.param.name; });

}  // namespace
