// The queries put to host controllers and hubs.
//
// Every function takes an open handle, sends one or two requests and blocks until the driver has
// answered. A failed request gives the empty text or false; nothing else is reported. What a driver
// answers is not trusted: no byte beyond those received is read.
#pragma once

#include <cstdint>
#include <string>

#include "platform/host.h"
#include "platform/usb_ioctl.h"
#include "records/records.h"
#include "records/usb_port_info.h"

namespace KelvoUHW {

// Of a host controller.
std::u16string GetHcdDriverKeyName(platform::DeviceIo& io, platform::FileHandle controller);
// Symbolic name, without "\\.\".
std::u16string GetRootHubName(platform::DeviceIo& io, platform::FileHandle controller);

// Of a hub. Ports count from 1.
bool GetNodeInformation(platform::DeviceIo& io, platform::FileHandle hub,
                        platform::USB_NODE_INFORMATION& information) noexcept;
// Whether the port answers the newer connection request; its data is discarded.
bool ProbeConnectionInformationEx(platform::DeviceIo& io, platform::FileHandle hub,
                                  std::uint32_t port);
// Fills the record from the older connection request, which knows low speed or not and nothing
// more.
bool GetConnectionInformation(platform::DeviceIo& io, platform::FileHandle hub, std::uint32_t port,
                              ConnectionRecord& record);
// Symbolic name of the hub on the port.
std::u16string GetConnectionName(platform::DeviceIo& io, platform::FileHandle hub,
                                 std::uint32_t port);
std::u16string GetConnectionDriverKeyName(platform::DeviceIo& io, platform::FileHandle hub,
                                          std::uint32_t port);

// Stores the controller's driver key name; false when it is empty.
bool ReadDriverKeyName(platform::DeviceIo& io, platform::FileHandle handle,
                       CZKUMHostControllerImpl& controller);

class DriverKeyIndex;

// Finds the controller's device by its driver key and fills in its identity, PCI numbers,
// description and root hub name, in this order; false at the first that is missing. What was filled
// in stays.
bool Initialise(platform::DeviceIo& io, platform::DeviceManager& manager, DriverKeyIndex& index,
                platform::FileHandle handle, CZKUMHostControllerImpl& controller);

}  // namespace KelvoUHW
