// Receivers opened through rcvlink.hpp.
#ifndef RCVLINK_TESTS_HOST_SUPPORT_HPP_H_
#define RCVLINK_TESTS_HOST_SUPPORT_HPP_H_

#include <string>
#include <system_error>

#include "rcvlink.hpp"
#include "tests/host/support/receiver.h"
#include "tests/host/support/velmar.h"

namespace host {

inline rcvlink::Receiver OpenHpp(const bed::SimulatedPort& port, DWORD speed = CBR_9600) {
  return rcvlink::Receiver::FindAt(port.name(), Settings(speed));
}

// The handle of one more user of a receiver that is open.
inline void* SecondUser(const bed::SimulatedPort& port) {
  std::wstring name = port.name();
  void* handle = nullptr;
  devapi::OpenReceiver(name.data(), &handle);
  return handle;
}

// The code of the std::system_error that a function throws; none when it throws nothing.
template <typename Function>
std::error_code CodeOf(Function function) {
  try {
    function();
    return {};
  } catch (const std::system_error& error) {
    return error.code();
  }
}

}  // namespace host

#endif  // RCVLINK_TESTS_HOST_SUPPORT_HPP_H_
