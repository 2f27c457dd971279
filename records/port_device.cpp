#include "records/port_device.h"

#include <cstddef>
#include <utility>

#include "platform/text.h"
#include "platform/usb_ioctl.h"
#include "records/descriptor_dump.h"
#include "records/usb_names.h"

namespace KelvoUHW {

namespace {

std::u16string StringText(const StringDescriptorNode* head, std::uint8_t index) {
  const StringDescriptorNode* found = FindStringDescriptor(head, index);
  return found ? found->Text() : std::u16string();
}

}  // namespace

CZKUMPortDeviceImpl::CZKUMPortDeviceImpl(platform::DevInst node,
                                         std::unique_ptr<ConnectionRecord> connectionInfo,
                                         std::unique_ptr<DescriptorRequest> configDesc,
                                         std::unique_ptr<StringDescriptorNode> stringDescs,
                                         std::u16string driverKeyName, std::u16string description,
                                         std::u16string instanceId)
    : CZKUMUsbTreeNodeImpl(KUDTPortDevice),
      m_pPortInfo(std::make_unique<UsbPortInfo>(
          UsbPortInfo{std::move(connectionInfo), std::move(configDesc), std::move(stringDescs)})) {
  m_devInstHandle = node;
  m_strDeviceDescr = std::move(description);
  m_strDriverKeyName = std::move(driverKeyName);
  SetInstanceId(std::move(instanceId));

  const StringDescriptorNode* strings = m_pPortInfo->StringDescs.get();
  if (const ConnectionRecord* record = ConnectionInfo()) {
    const platform::USB_DEVICE_DESCRIPTOR& device = record->Info.DeviceDescriptor;
    m_nVendorId = device.idVendor;
    m_nProductId = device.idProduct;
    m_strUsbManufacturer = StringText(strings, device.iManufacturer);
    m_strUsbProduct = StringText(strings, device.iProduct);
    SetSerialNumber(StringText(strings, device.iSerialNumber));
  }
  if (m_pPortInfo->ConfigDesc) {
    m_rawInterfaceDescriptors = SplitConfiguration(m_pPortInfo->ConfigDesc->Data);
    m_interfaceDescrs = MakeInterfaceEntries(m_rawInterfaceDescriptors, strings);
  }
}

CZKUMPortDeviceImpl::~CZKUMPortDeviceImpl() {
  if (!m_infoDevice) return;
  m_infoDevice->m_pParent.ClearIfNaming(this);
  // The port knows the device-manager node through this record alone.
  if (m_pParent) m_infoDevice->m_pParent.ClearIfNaming(m_pParent);
}

bool CZKUMPortDeviceImpl::AcceptNode(const NodePtr&) { return true; }

void CZKUMPortDeviceImpl::OwnLines(std::u16string& out, const std::u16string& indent) const {
  const ConnectionRecord* record = ConnectionInfo();
  if (record && record->Info.ConnectionStatus != platform::NoDeviceConnected) {
    AppendLine(out, indent, u"PortDevice: ==================================================");
    BaseToString(out, indent);
    AppendLine(out, indent, u"manufacturer  : ", m_strUsbManufacturer);
    AppendLine(out, indent, u"product       : ", m_strUsbProduct);
    // A vendor without a name is printed as the platform's formatted print writes a missing text.
    AppendLineOf(out, indent, u"idVendor      : 0x", platform::Hex(m_nVendorId, 4), u" ",
                 VendorName(static_cast<std::uint16_t>(m_nVendorId)).value_or(u"(null)"));
    DumpConnectionInformation(*record, indent, out);
    if (m_pPortInfo->ConfigDesc) {
      DumpConfiguration(m_rawInterfaceDescriptors, m_pPortInfo->StringDescs.get(), indent, out);
    }
    for (const InterfaceEntryPtr& entry : m_interfaceDescrs) {
      DumpInterface(*entry, indent + u". ", out);
    }
    AppendLine(out, indent, u"End device -------------------------------------------");
  }
  if (m_infoDevice) m_infoDevice->ToString(out, indent);
}

std::uint8_t CZKUMPortDeviceImpl::Speed() const noexcept {
  return ConnectionInfo() ? ConnectionInfo()->Info.Speed : std::uint8_t{0};
}

std::uint8_t CZKUMPortDeviceImpl::NumberInterfaces() const noexcept {
  constexpr std::size_t kNumInterfaces =
      offsetof(platform::USB_CONFIGURATION_DESCRIPTOR, bNumInterfaces);
  for (const RawDescriptor& descriptor : m_rawInterfaceDescriptors) {
    if (descriptor[1] != platform::kUSB_CONFIGURATION_DESCRIPTOR_TYPE) continue;
    return descriptor.size() > kNumInterfaces ? descriptor[kNumInterfaces] : std::uint8_t{0};
  }
  return 0;
}

}  // namespace KelvoUHW
