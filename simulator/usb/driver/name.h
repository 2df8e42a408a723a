// Names of kernel objects: constant ones, and ones that are put together.
#ifndef SIMULATOR_USB_DRIVER_NAME_H_
#define SIMULATOR_USB_DRIVER_NAME_H_

#include <cstddef>

#include "simulator/usb/driver/kernel.h"

namespace usb_driver {

// The most digits of a ULONG.
inline constexpr size_t kMaxDigits = 10;

template <size_t kCount>
constexpr size_t Length(const wchar_t (&)[kCount]) {
  return kCount - 1;
}

template <size_t kCount>
UNICODE_STRING Constant(const wchar_t (&text)[kCount]) {
  const auto bytes = static_cast<USHORT>(Length(text) * sizeof(wchar_t));
  return {bytes, bytes, const_cast<wchar_t*>(text)};
}

// A name that is put together in place. What goes beyond its capacity is cut off.
template <size_t kCapacity>
class Name {
 public:
  void Append(const wchar_t* text, size_t length) {
    for (size_t i = 0; i < length && length_ < kCapacity; ++i) {
      text_[length_++] = text[i];
    }
  }
  void Append(ULONG number) {
    wchar_t digits[kMaxDigits];
    size_t first = kMaxDigits;
    do {
      digits[--first] = static_cast<wchar_t>(L'0' + number % 10);
      number /= 10;
    } while (number != 0);
    Append(digits + first, kMaxDigits - first);
  }
  // Valid as long as the name is not changed.
  UNICODE_STRING Get() {
    const auto bytes = static_cast<USHORT>(length_ * sizeof(wchar_t));
    return {bytes, bytes, text_};
  }

 private:
  wchar_t text_[kCapacity] = {};
  size_t length_ = 0;
};

}  // namespace usb_driver

#endif  // SIMULATOR_USB_DRIVER_NAME_H_
