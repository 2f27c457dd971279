// The records of the USB walk: root, host controller, hub, hub port.
#pragma once

#include <memory>
#include <string>

#include "platform/guid.h"
#include "platform/usb_ioctl.h"
#include "records/node.h"
#include "records/usb_port_info.h"

namespace KelvoUHW {

class CZKUMUsbTreeRootImpl final : public CZKUMUsbTreeNodeImpl {
 public:
  CZKUMUsbTreeRootImpl();
  // The root writes no line of its own, only its children.
  void OwnLines(std::u16string& out, const std::u16string& indent) const override;
};

class CZKUMHostControllerImpl final : public CZKUMUsbTreeNodeImpl {
 public:
  CZKUMHostControllerImpl() noexcept : CZKUMUsbTreeNodeImpl(KUDTHostController) {}
  void OwnLines(std::u16string& out, const std::u16string& indent) const override;

  void SetLeafName(std::u16string name) { m_strLeafName = std::move(name); }

  std::uint32_t m_nPciVendorId = 0;
  std::uint32_t m_nPciDeviceId = 0;
  std::uint32_t m_nPciSubSysId = 0;
  std::uint32_t m_nPciRevision = 0;
  // The name it was opened under: "\\.\HCD" and a digit, or a device-interface path.
  std::u16string m_strLeafName;
  // Symbolic name, without "\\.\".
  std::u16string m_strRootHubName;
};

class CZKUMHubDeviceImpl final : public CZKUMUsbTreeNodeImpl {
 public:
  CZKUMHubDeviceImpl() noexcept : CZKUMUsbTreeNodeImpl(KUDTHub) {}
  // The connection record stays allocated for the life of the process: it is handed on, not freed.
  // Only the string list and the port information are freed. This is deliberate.
  ~CZKUMHubDeviceImpl() override;
  void OwnLines(std::u16string& out, const std::u16string& indent) const override;

  // Takes a symbolic name apart into path, instance id and GUID.
  void SetHubName(const std::u16string& name);
  // Makes this a hub below a port; takes over all three, any of which may be null.
  void SetConnectionInfo(std::unique_ptr<ConnectionRecord> connectionInfo,
                         std::unique_ptr<DescriptorRequest> configDesc,
                         std::unique_ptr<StringDescriptorNode> stringDescs);
  std::uint8_t NumberOfPorts() const noexcept {
    return m_nodeInformation.HubDescriptor.bNumberOfPorts;
  }
  // "[PortN] STATUS :  " for a hub below a port, then the description or else the symbolic name.
  std::u16string LeafName() const;

  std::u16string m_strConnectionName;
  std::u16string m_strPathName;  // what it opens under
  platform::Guid m_guid{};       // behind the first brace of the name; zero without one
  bool m_bHasConnectionInfo = false;
  std::unique_ptr<UsbPortInfo> m_pPortInfo;
  platform::USB_NODE_INFORMATION m_nodeInformation{};
};

// What a hub port says about its device.
enum HubPortStatus : std::uint32_t {
  KPortEmpty = 0,
  KPortConnected = 1,
  KPortUnconfigured = 2,  // the device's current configuration value is 0
};

class CZKUMHubPortImpl final : public CZKUMUsbTreeNodeImpl {
 public:
  explicit CZKUMHubPortImpl(std::uint32_t portIndex) noexcept
      : CZKUMUsbTreeNodeImpl(KUDTHubPort), m_nPortIndex(portIndex) {}
  // The device-manager node of a device on the port names the port as its parent, though the device
  // holds it: its link goes to null with the port.
  ~CZKUMHubPortImpl() override;
  // A port writes no base lines.
  void OwnLines(std::u16string& out, const std::u16string& indent) const override;

  std::uint32_t m_nPortIndex;  // 1 is the first
  std::uint32_t m_nStatus = KPortEmpty;
};

}  // namespace KelvoUHW
