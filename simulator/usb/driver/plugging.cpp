#include "simulator/usb/driver/plugging.h"

#include <algorithm>

#include "simulator/usb/driver/completion.h"
#include "simulator/usb/driver/name.h"
#include "simulator/usb/driver/traffic.h"

namespace usb_driver {
namespace {

constexpr wchar_t kDevicePrefix[] = L"\\Device\\RcvlinkUsb";
using DeviceName = Name<Length(kDevicePrefix) + kMaxDigits>;

// Empty from the start: the kernel runs no constructors when it loads a driver.
constinit LIST_ENTRY host_devices = {&host_devices, &host_devices};
ULONG last_device;

bool IsNameCharacter(wchar_t character) {
  return (character >= L'A' && character <= L'Z') || (character >= L'a' && character <= L'z') ||
         (character >= L'0' && character <= L'9') || character == L'-' || character == L'_' ||
         character == L'.';
}

bool IsName(const wchar_t* text, size_t length) {
  return length != 0 && length <= usb_bus::kMaxNameLength &&
         std::all_of(text, text + length, IsNameCharacter);
}

DeviceName NameOfDevice(ULONG number) {
  DeviceName name;
  name.Append(kDevicePrefix, Length(kDevicePrefix));
  name.Append(number);
  return name;
}

LinkName NameOfLink(const wchar_t* text, size_t length) {
  LinkName name;
  name.Append(kLinkPrefix, Length(kLinkPrefix));
  name.Append(text, length);
  return name;
}

bool ChangeState(Plug* plug, PlugState from, PlugState to) {
  const StateGuard guard;
  if (plug->state != from) {
    return false;
  }
  plug->state = to;
  return true;
}

// Gives a device that is not in use to the plug; null when there is none.
HostDevice* ReuseDevice(Plug* plug) {
  const StateGuard guard;
  for (LIST_ENTRY* entry = host_devices.Flink; entry != &host_devices; entry = entry->Flink) {
    auto* const device = At<HostDevice>(entry);
    if (device->plug == nullptr && device->open_handles == 0) {
      device->plug = plug;
      return device;
    }
  }
  return nullptr;
}

NTSTATUS MakeDevice(DRIVER_OBJECT* driver, Plug* plug, HostDevice** made) {
  ULONG number = 0;
  {
    const StateGuard guard;
    number = ++last_device;
  }
  DeviceName name = NameOfDevice(number);
  UNICODE_STRING text = name.Get();
  DEVICE_OBJECT* object = nullptr;
  const NTSTATUS status =
      IoCreateDevice(driver, sizeof(HostDevice), &text, FILE_DEVICE_UNKNOWN, 0, FALSE, &object);
  if (!NT_SUCCESS(status)) {
    return status;
  }
  auto* const device = static_cast<HostDevice*>(object->DeviceExtension);
  device->object = object;
  device->number = number;
  device->plug = plug;
  device->open_handles = 0;
  {
    const StateGuard guard;
    InsertTailList(&host_devices, &device->link);
  }
  object->Flags |= DO_BUFFERED_IO;
  object->Flags &= ~static_cast<ULONG>(DO_DEVICE_INITIALIZING);
  *made = device;
  return STATUS_SUCCESS;
}

NTSTATUS MakeLink(LinkName& link_name, const HostDevice& device) {
  DeviceName device_name = NameOfDevice(device.number);
  UNICODE_STRING target = device_name.Get();
  UNICODE_STRING link = link_name.Get();
  return IoCreateSymbolicLink(&link, &target);
}

}  // namespace

NTSTATUS PlugIn(DRIVER_OBJECT* driver, Plug* plug, const wchar_t* name, size_t length) {
  if (!IsName(name, length)) {
    return STATUS_INVALID_PARAMETER;
  }
  if (!ChangeState(plug, PlugState::kNew, PlugState::kChanging)) {
    return STATUS_INVALID_DEVICE_STATE;
  }
  plug->link_name = NameOfLink(name, length);
  HostDevice* device = ReuseDevice(plug);
  NTSTATUS status = device == nullptr ? MakeDevice(driver, plug, &device) : STATUS_SUCCESS;
  if (NT_SUCCESS(status)) {
    status = MakeLink(plug->link_name, *device);
  }
  const StateGuard guard;
  if (NT_SUCCESS(status)) {
    plug->device = device;
    plug->state = PlugState::kPluggedIn;
  } else {
    if (device != nullptr) {
      device->plug = nullptr;
    }
    plug->state = PlugState::kNew;
  }
  return status;
}

NTSTATUS Unplug(Plug* plug) {
  if (!ChangeState(plug, PlugState::kPluggedIn, PlugState::kChanging)) {
    return STATUS_INVALID_DEVICE_STATE;
  }
  UNICODE_STRING link = plug->link_name.Get();
  IoDeleteSymbolicLink(&link);
  Completions completions;
  const StateGuard guard;
  EndRequests(plug, /*handle=*/nullptr, STATUS_DEVICE_NOT_CONNECTED, completions);
  while (!IsListEmpty(&plug->transfers)) {
    Unlink(At<Transfer>(plug->transfers.Flink));
  }
  if (plug->waiting != nullptr && Claim(plug->waiting)) {
    completions.Add(plug->waiting, STATUS_DEVICE_NOT_CONNECTED);
    plug->waiting = nullptr;
  }
  plug->device->plug = nullptr;
  plug->device = nullptr;
  plug->state = PlugState::kGone;
  return STATUS_SUCCESS;
}

void DeleteHostDevices() {
  while (!IsListEmpty(&host_devices)) {
    IoDeleteDevice(At<HostDevice>(RemoveHeadList(&host_devices))->object);
  }
}

}  // namespace usb_driver
