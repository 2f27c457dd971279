// The record of a device on a hub port.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "records/interface_entry.h"
#include "records/node.h"
#include "records/usb_port_info.h"

namespace KelvoUHW {

class CZKUMPortDeviceImpl final : public CZKUMUsbTreeNodeImpl {
 public:
  // Every part may be missing: handle 0, null pointers, empty texts. With a connection record the
  // vendor and product ids are those of its device descriptor, whatever the instance id says; texts
  // and interfaces come from the string list and the configuration descriptor.
  CZKUMPortDeviceImpl(platform::DevInst node, std::unique_ptr<ConnectionRecord> connectionInfo,
                      std::unique_ptr<DescriptorRequest> configDesc,
                      std::unique_ptr<StringDescriptorNode> stringDescs,
                      std::u16string driverKeyName, std::u16string description,
                      std::u16string instanceId);
  ~CZKUMPortDeviceImpl() override;

  bool AcceptNode(const NodePtr& node) override;
  void OwnLines(std::u16string& out, const std::u16string& indent) const override;

  // The connection record's speed byte; 0 without a record.
  std::uint8_t Speed() const noexcept;
  // bNumInterfaces of the first configuration descriptor, 0 without one.
  std::uint8_t NumberInterfaces() const noexcept;
  const ConnectionRecord* ConnectionInfo() const noexcept {
    return m_pPortInfo->ConnectionInfo.get();
  }

  std::u16string m_strUsbManufacturer;
  std::u16string m_strUsbProduct;
  std::vector<InterfaceEntryPtr> m_interfaceDescrs;
  std::vector<RawDescriptor> m_rawInterfaceDescriptors;  // into m_pPortInfo->ConfigDesc
  // The device-manager node matched to this device; its dump follows the device's own.
  NodePtr m_infoDevice;
  const std::unique_ptr<UsbPortInfo> m_pPortInfo;  // never null
};

}  // namespace KelvoUHW
