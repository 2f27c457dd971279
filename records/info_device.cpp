#include "records/info_device.h"

#include <array>

#include "platform/text.h"
#include "records/devnode.h"

namespace KelvoUHW {

namespace {

// Bus types from -1 up. The last name, for 17, is no bus type but the first excluded service: by
// design, the dump has always let that value through and shown the text that lies behind the table.
constexpr std::array<std::u16string_view, 19> kBusTypeNames{u"InterfaceTypeUndefined",
                                                            u"Internal",
                                                            u"Isa",
                                                            u"Eisa",
                                                            u"MicroChannel",
                                                            u"TurboChannel",
                                                            u"PCIBus",
                                                            u"VMEBus",
                                                            u"NuBus",
                                                            u"PCMCIABus",
                                                            u"CBus",
                                                            u"MPIBus",
                                                            u"MPSABus",
                                                            u"ProcessorInternal",
                                                            u"InternalPowerBus",
                                                            u"PNPISABus",
                                                            u"PNPBus",
                                                            u"MaximumInterfaceType",
                                                            u"usbhub"};

}  // namespace

CZKUMInfoDeviceImpl::CZKUMInfoDeviceImpl() : CZKUMUsbTreeNodeImpl(KUDTInfoDevice) { Reset(); }

void CZKUMInfoDeviceImpl::Reset() {
  SetSerialNumber({});
  SetInstanceId({});
  for (std::u16string* text : {&m_strDeviceDescr, &m_strDriverKeyName, &PhysicalName, &m_strVendor,
                               &m_strProduct, &m_strDevInstIdParent}) {
    text->clear();
  }
  for (SharedText* text :
       {&DevClass, &ClassGuidText, &FriendlyName, &Manufacturer, &HardwareId, &Service}) {
    text->clear();
  }
  ClassGuid = {};
  m_nVendorId = m_nProductId = kUnknownId;
  UiNumber = LegacyBusType = -1;
  m_devInstHandle = m_devInstHandleParent = kUnknownDevInst;
}

void CZKUMInfoDeviceImpl::OwnLines(std::u16string& out, const std::u16string& indent) const {
  const auto lineIfAny = [&](std::u16string_view label, std::u16string_view value) {
    if (!value.empty()) AppendLine(out, indent, label, value);
  };

  AppendLine(out, indent, u" Info ------------------------------------------");
  BaseToString(out, indent);
  // Deliberate: the class name decides about the line, the text of its GUID is what it shows.
  if (!DevClass.empty()) AppendLine(out, indent, u"SPDRP_CLASS: ", ClassGuidText);
  if (ClassGuid != platform::kNullGuid) {
    AppendLine(out, indent, u"SPDRP_CLASS: ", platform::GuidText(ClassGuid));
  }
  lineIfAny(u"SPDRP_FRIENDLYNAME: ", FriendlyName);
  lineIfAny(u"SPDRP_MFG: ", Manufacturer);
  if (LegacyBusType >= -1 && LegacyBusType < 18) {
    const std::int32_t row = LegacyBusType + 1;
    AppendLine(out, indent, u"INTERFACE_TYPE: ", kBusTypeNames[static_cast<std::size_t>(row)]);
  }
  lineIfAny(u"SPDRP_HARDWAREID: ", HardwareId);
  lineIfAny(u"SPDRP_PHYSICAL_DEVICE_OBJECT_NAME: ", PhysicalName);
  lineIfAny(u"SPDRP_SERVICE: ", Service);
  lineIfAny(u"SPDRP_ENUMERATOR_NAME: ", EnumName);
  lineIfAny(u"SPDRP_LOCATION_INFORMATION: ", Location);
  if (UiNumber != -1) {
    AppendLine(out, indent, u"SPDRP_UI_NUMBER    : 0x",
               platform::Hex(static_cast<std::uint32_t>(UiNumber)));
  }
}

}  // namespace KelvoUHW
