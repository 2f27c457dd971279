// The record of one device-manager node below a USB, PCI, SCSI or SD parent.
#pragma once

#include <cstdint>
#include <string>

#include "platform/guid.h"
#include "records/node.h"

namespace KelvoUHW {

// Registry properties of the node; those it does not have are empty, zero or -1.
class CZKUMInfoDeviceImpl final : public CZKUMUsbTreeNodeImpl {
 public:
  CZKUMInfoDeviceImpl();
  void OwnLines(std::u16string& out, const std::u16string& indent) const override;

  // Makes the record ready for the next node. Serial number, Location and EnumName deliberately
  // stay: a node that lacks them shows those of the node read before it.
  void Reset();

  std::u16string DevClass;
  std::u16string ClassGuidText;
  platform::Guid ClassGuid{};
  std::u16string Location;
  std::u16string FriendlyName;
  std::u16string Manufacturer;
  std::u16string HardwareId;  // the first of the list
  std::u16string PhysicalName;
  std::u16string Service;
  std::int32_t LegacyBusType = -1;  // see ReadInfoDeviceProperties
  std::u16string EnumName;
  std::int32_t UiNumber = -1;  // see ReadInfoDeviceProperties
};

using InfoDevicePtr = RingPtr<CZKUMInfoDeviceImpl>;

}  // namespace KelvoUHW
