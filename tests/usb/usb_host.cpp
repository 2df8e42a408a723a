#include "tests/usb/usb_host.h"

#include <gtest/gtest.h>

#include <algorithm>

namespace usb_host {
namespace {

constexpr DWORD kPatienceMs = 20'000;
constexpr size_t kConfigurationLength = 260;

void Put(Bytes& bytes, size_t offset, uint32_t number, size_t size) {
  for (size_t i = 0; i < size; ++i) bytes[offset + i] = static_cast<uint8_t>(number >> 8 * i);
}

}  // namespace

Pending::Pending(HANDLE file, size_t room) : file_(file), state_(std::make_unique<State>()) {
  state_->buffer.resize(room);
  state_->event.reset(CreateEventW(nullptr, TRUE, FALSE, nullptr));
  state_->overlapped.hEvent = state_->event.get();
}

Pending::~Pending() {
  if (!state_ || state_->error != ERROR_IO_PENDING) return;
  CancelIoEx(file_, overlapped());
  DWORD count = 0;
  GetOverlappedResult(file_, overlapped(), &count, TRUE);
}

void Pending::Made(BOOL result) {
  if (!result) state_->error = GetLastError();
}

bool Pending::Ended() const { return WaitForSingleObject(state_->event.get(), 0) == WAIT_OBJECT_0; }

Result Pending::Finish() {
  if (state_->error != ERROR_IO_PENDING) return {state_->error};
  if (WaitForSingleObject(state_->event.get(), kPatienceMs) != WAIT_OBJECT_0) {
    ADD_FAILURE() << "the request does not end";
    return {WAIT_TIMEOUT};
  }
  DWORD count = 0;
  const BOOL done = GetOverlappedResult(file_, overlapped(), &count, FALSE);
  state_->error = done ? ERROR_SUCCESS : GetLastError();
  Result result{state_->error};
  if (done) {
    const size_t length = std::min<size_t>(count, state_->buffer.size());
    result.bytes.assign(state_->buffer.begin(),
                        state_->buffer.begin() + static_cast<std::ptrdiff_t>(length));
  }
  return result;
}

File::File(const std::wstring& path, DWORD access)
    : handle_(CreateFileW(
          path.c_str(), access, 0, nullptr, OPEN_EXISTING, FILE_FLAG_OVERLAPPED, nullptr)),
      error_(open() ? ERROR_SUCCESS : GetLastError()) {}

Pending File::StartControl(DWORD code, const Bytes& input, size_t room) const {
  Pending pending(get(), room);
  Bytes copy = input;
  // A request without input has a null pointer, as hosts give it.
  pending.Made(DeviceIoControl(get(),
                               code,
                               copy.empty() ? nullptr : copy.data(),
                               static_cast<DWORD>(copy.size()),
                               pending.room() == 0 ? nullptr : pending.buffer(),
                               pending.room(),
                               nullptr,
                               pending.overlapped()));
  return pending;
}

Pending File::StartRead(size_t room) const {
  Pending pending(get(), room);
  pending.Made(ReadFile(get(), pending.buffer(), pending.room(), nullptr, pending.overlapped()));
  return pending;
}

Pending File::StartWrite(std::string_view text) const {
  Pending pending(get(), text.size());
  std::copy(text.begin(), text.end(), pending.buffer());
  pending.Made(WriteFile(get(), pending.buffer(), pending.room(), nullptr, pending.overlapped()));
  return pending;
}

Result File::Control(DWORD code, const Bytes& input, size_t room) const {
  return StartControl(code, input, room).Finish();
}

Result File::Read(size_t room) const { return StartRead(room).Finish(); }

Result File::Write(std::string_view text) const { return StartWrite(text).Finish(); }

DWORD File::Configure(uint32_t transfer) const {
  return Control(kSetConfiguration, Configuration(transfer)).error;
}

std::string File::ReadAll(size_t size) const {
  std::string text;
  while (text.size() < size) {
    const Result result = Read(size - text.size());
    if (result.error != ERROR_SUCCESS) {
      ADD_FAILURE() << "a read ended with " << result.error << " behind " << text.size();
      return text;
    }
    text += result.text();
  }
  return text;
}

Bytes DescriptorRequest(uint8_t type, uint8_t index, uint32_t recipient) {
  Bytes request(8);
  Put(request, 0, recipient, 4);
  request[4] = type;
  request[5] = index;
  return request;
}

Bytes Configuration(uint32_t transfer, uint16_t index, uint16_t interfaces) {
  Bytes configuration(kConfigurationLength);
  Put(configuration, 0, index, 2);
  Put(configuration, 2, interfaces, 2);
  Put(configuration, 8, transfer, 4);
  return configuration;
}

Connected::Connected(const std::wstring& path, uint8_t in, uint8_t out)
    : writer(path, GENERIC_WRITE), reader(path, GENERIC_READ) {
  EXPECT_TRUE(writer.open() && reader.open()) << writer.error() << " " << reader.error();
  EXPECT_EQ(reader.Configure(), DWORD{ERROR_SUCCESS});
  EXPECT_EQ(writer.Bind(out), DWORD{ERROR_SUCCESS});
  EXPECT_EQ(reader.Bind(in), DWORD{ERROR_SUCCESS});
}

}  // namespace usb_host
