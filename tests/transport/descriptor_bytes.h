// Makes the descriptors of a USB device.
#ifndef RCVLINK_TESTS_TRANSPORT_DESCRIPTOR_BYTES_H_
#define RCVLINK_TESTS_TRANSPORT_DESCRIPTOR_BYTES_H_

#include <cstdint>
#include <initializer_list>
#include <string>

inline constexpr uint8_t kControl = 0;
inline constexpr uint8_t kIsochronous = 1;
inline constexpr uint8_t kBulk = 2;
inline constexpr uint8_t kInterrupt = 3;

inline std::string Bytes(std::initializer_list<unsigned> values) {
  std::string bytes;
  for (const unsigned value : values) bytes += static_cast<char>(value);
  return bytes;
}

// With padding after its nine bytes, or cut, according to `length`.
inline std::string InterfaceBytes(size_t endpoints, size_t length = 9) {
  std::string bytes = Bytes(
      {static_cast<unsigned>(length), 0x04, 0, 0, static_cast<unsigned>(endpoints), 0xFF, 0, 0, 0});
  bytes.resize(length, '\x5A');
  return bytes;
}

inline std::string EndpointBytes(uint8_t address, uint8_t attributes, uint8_t length = 7) {
  return Bytes({length, 0x05, address, attributes, 0x00, 0x02, 0x00});
}

// A configuration descriptor before its parts. The total length is right.
inline std::string ConfigurationBytes(const std::string& rest, size_t length = 9) {
  const size_t total = length + rest.size();
  std::string bytes = Bytes({static_cast<unsigned>(length),
                             0x02,
                             static_cast<unsigned>(total & 0xFF),
                             static_cast<unsigned>(total >> 8),
                             1,
                             1,
                             0,
                             0x80,
                             50});
  bytes.resize(length, '\xA5');
  return bytes + rest;
}

// A device with one interface and these endpoints.
inline std::string DeviceBytes(std::initializer_list<std::string> endpoints) {
  std::string rest = InterfaceBytes(endpoints.size());
  for (const std::string& endpoint : endpoints) rest += endpoint;
  return ConfigurationBytes(rest);
}

#endif  // RCVLINK_TESTS_TRANSPORT_DESCRIPTOR_BYTES_H_
