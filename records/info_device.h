// The record of one device-manager node below a USB, PCI, SCSI or SD parent.
#pragma once

#include <cstdint>
#include <string>

#include "platform/guid.h"
#include "records/node.h"
#include "records/shared_text.h"

namespace KelvoUHW {

// Registry properties of the node; those it does not have are empty, zero or -1.
class CZKUMInfoDeviceImpl final : public CZKUMUsbTreeNodeImpl {
 public:
  CZKUMInfoDeviceImpl();
  void OwnLines(std::u16string& out, const std::u16string& indent) const override;

  // Makes the record ready for the next node. Serial number, Location and EnumName deliberately
  // stay: a node that lacks them shows those of the node read before it.
  void Reset();

  SharedText DevClass;
  SharedText ClassGuidText;
  platform::Guid ClassGuid{};
  std::u16string Location;
  SharedText FriendlyName;
  SharedText Manufacturer;
  SharedText HardwareId;  // the first of the list
  std::u16string PhysicalName;
  SharedText Service;
  std::int32_t LegacyBusType = -1;  // see ReadInfoDeviceProperties
  SharedText EnumName;
  std::int32_t UiNumber = -1;  // see ReadInfoDeviceProperties
};

using InfoDevicePtr = RingPtr<CZKUMInfoDeviceImpl>;

}  // namespace KelvoUHW
