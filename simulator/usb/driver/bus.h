// What the bus driver and the program that plays a device say to each other.
//
// A program opens the bus and plugs a device in. It then gets the requests of hosts for that
// device, and executes them. The driver itself knows nothing of USB. It only keeps the bytes on
// their way to the host, so that a read that is cancelled at the last moment loses none.
//
// Closing the handle unplugs the device. So does the program's death.
#ifndef SIMULATOR_USB_DRIVER_BUS_H_
#define SIMULATOR_USB_DRIVER_BUS_H_

#include <cstddef>
#include <cstdint>

namespace usb_bus {

inline constexpr wchar_t kServiceName[] = L"rcvlink-usb-bus";
inline constexpr wchar_t kDriverFile[] = L"rcvlink-usb-bus.sys";
inline constexpr wchar_t kBusPath[] = L"\\\\.\\rcvlink-usb-bus";

constexpr uint32_t BufferedCode(uint32_t function) {
  constexpr uint32_t kUnknownDevice = 0x22;
  return kUnknownDevice << 16 | function << 2;
}

// Input: the name of the device, of 1 to kMaxNameLength UTF-16 letters, digits, '-', '_' or '.'.
// The host then opens \\?\NAME.
inline constexpr uint32_t kPlugIn = BufferedCode(0x800);
// Unplugs the device: pending requests fail, and so does every later one. No input. After the call
// the path can no longer be opened.
inline constexpr uint32_t kUnplug = BufferedCode(0x801);
// Input: Actions, executed one after the other. The first that is wrong ends the call.
inline constexpr uint32_t kAct = BufferedCode(0x802);
// The same, and then waits for requests of the host; one such call at a time. Output: one or more
// Requests in the order in which they came. There must be room for the largest one.
inline constexpr uint32_t kActAndWait = BufferedCode(0x803);

inline constexpr size_t kMaxNameLength = 64;
// The most that a host can write, or hand to a device control code, at once.
inline constexpr size_t kMaxInput = size_t{64} * 1024;
// Requests and actions begin at multiples of this.
inline constexpr size_t kAlignment = 8;

constexpr size_t Aligned(size_t length) { return (length + kAlignment - 1) & ~(kAlignment - 1); }

enum class RequestKind : uint32_t {
  kControl,  // DeviceIoControl
  kRead,     // only from handles whose reads do not get what is sent
  kWrite,
  kClosed  // The handle is closed. That is not answered.
};

// What a host asks for. Its bytes follow, and then the next request.
struct Request {
  uint64_t id;
  // Numbers the handles that hosts have opened; none is used twice.
  uint32_t handle;
  RequestKind kind;
  uint32_t control_code;
  // The bytes that follow.
  uint32_t length;
  // How many bytes the host takes in return.
  uint32_t room;
  uint32_t reserved;
};

enum class ActionKind : uint32_t {
  // Answers a request. An answer to one that the host has cancelled is ignored.
  kAnswer,
  // One transfer to the host: a read gets no more than what is left of it.
  kSend
};

enum class Reads : uint32_t {
  kUnchanged,
  kGetTransfers,  // The handle's reads get what is sent, and are no requests.
  kAreRequests    // They are requests, as they are at first. Pending ones are cancelled.
};

// What a program does. Its bytes follow, and then the next action.
struct Action {
  // The request that is answered.
  uint64_t id;
  ActionKind kind;
  // Of an answer, an NTSTATUS. With an error no byte reaches the host.
  uint32_t status;
  // The number of bytes that the host gets as result: all that follow, or how many of a write's.
  uint32_t count;
  // What becomes of the reads of the handle that the request came from.
  Reads reads;
  // The bytes that follow.
  uint32_t length;
  uint32_t reserved;
};

inline constexpr size_t kRequestBufferSize = sizeof(Request) + kMaxInput;

static_assert(sizeof(Request) % kAlignment == 0 && sizeof(Action) % kAlignment == 0);

}  // namespace usb_bus

#endif  // SIMULATOR_USB_DRIVER_BUS_H_
