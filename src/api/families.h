// The families of receivers that the library knows.
#ifndef RCVLINK_API_FAMILIES_H_
#define RCVLINK_API_FAMILIES_H_

#include <array>
#include <memory>
#include <utility>

#include "platform/api_types.h"
#include "quorin/quorin_protocol.h"
#include "velmar/velmar_protocol.h"

namespace rcvlink {

// What discovery needs to know of a family.
struct Family {
  EProtocol protocol;
  const wchar_t* name;  // for the report
  bool is_on_usb;
  // Whether a receiver of the family answers on the connection.
  bool (*probe)(CIConnection* connection, HANDLE abort_event);
  std::unique_ptr<CIProtocol> (*make)(std::unique_ptr<CIConnection> connection);
};

enum class OnUsb { kNo, kYes };

// The table's entry for the family of a driver.
template <typename Driver>
constexpr Family FamilyOf(EProtocol protocol, const wchar_t* name, OnUsb usb) {
  return {.protocol = protocol,
          .name = name,
          .is_on_usb = usb == OnUsb::kYes,
          .probe = Driver::Probe,
          .make = [](std::unique_ptr<CIConnection> connection) -> std::unique_ptr<CIProtocol> {
            return std::make_unique<Driver>(std::move(connection));
          }};
}

// In the order in which discovery asks for them. A new family is one more line.
inline constexpr std::array kFamilies = {
    FamilyOf<CQuorinProtocol>(eProtocolQuorin, L"Quorin", OnUsb::kYes),
    FamilyOf<CVelmarProtocol>(eProtocolVelmar, L"Velmar", OnUsb::kNo)};

}  // namespace rcvlink

#endif  // RCVLINK_API_FAMILIES_H_
