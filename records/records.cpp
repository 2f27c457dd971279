#include "records/records.h"

#include <utility>

#include "platform/text.h"
#include "records/identifiers.h"
#include "records/port_device.h"
#include "records/usb_names.h"

namespace KelvoUHW {

CZKUMUsbTreeRootImpl::CZKUMUsbTreeRootImpl() : CZKUMUsbTreeNodeImpl(KUDTRoot) {
  SetInstanceId(u"Abstract root");
}

void CZKUMUsbTreeRootImpl::OwnLines(std::u16string&, const std::u16string&) const {}

void CZKUMHostControllerImpl::OwnLines(std::u16string& out, const std::u16string& indent) const {
  AppendLine(out, indent, u"HostController:");
  BaseToString(out, indent);
  AppendLine(out, indent, u"LeafName    : ", m_strLeafName);
  AppendLine(out, indent, u"rootHubName : ", m_strRootHubName);
}

CZKUMHubDeviceImpl::~CZKUMHubDeviceImpl() {
  if (m_pPortInfo) ConnectionRecord::KeepForProcessLife(std::move(m_pPortInfo->ConnectionInfo));
}

void CZKUMHubDeviceImpl::OwnLines(std::u16string& out, const std::u16string& indent) const {
  AppendLine(out, indent, u"Hub :");
  BaseToString(out, indent);
  AppendLine(out, indent, u"leafName       : ", LeafName());
  AppendLine(out, indent, u"pathName       : ", m_strPathName);
  AppendLine(out, indent, u"connectionName : ", m_strConnectionName);
  AppendLine(out, indent, u"Port nb    : ", platform::Decimal(NumberOfPorts()));
}

void CZKUMHubDeviceImpl::SetHubName(const std::u16string& name) {
  m_strConnectionName = name;
  m_strPathName = u"\\\\.\\" + name;
  SetInstanceId(InterfacePathToInstanceId(name.c_str()));
  const std::size_t brace = name.find(u'{');
  if (brace != std::u16string::npos) m_guid = ParseGuidText(name.c_str() + brace);
}

void CZKUMHubDeviceImpl::SetConnectionInfo(std::unique_ptr<ConnectionRecord> connectionInfo,
                                           std::unique_ptr<DescriptorRequest> configDesc,
                                           std::unique_ptr<StringDescriptorNode> stringDescs) {
  m_bHasConnectionInfo = true;
  m_pPortInfo = std::make_unique<UsbPortInfo>(
      UsbPortInfo{std::move(connectionInfo), std::move(configDesc), std::move(stringDescs)});
}

std::u16string CZKUMHubDeviceImpl::LeafName() const {
  std::u16string name;
  if (m_bHasConnectionInfo && m_pPortInfo->ConnectionInfo) {
    const auto& info = m_pPortInfo->ConnectionInfo->Info;
    name = u"[Port" + platform::Decimal(static_cast<std::int32_t>(info.ConnectionIndex)) + u"] ";
    name += ConnectionStatusName(info.ConnectionStatus);
    name += u" :  ";
  }
  return name + (m_strDeviceDescr.empty() ? m_strConnectionName : m_strDeviceDescr);
}

CZKUMHubPortImpl::~CZKUMHubPortImpl() {
  for (const NodePtr& child : m_childs) {
    if (!child || child->m_nType != KUDTPortDevice) continue;
    const auto& device = static_cast<const CZKUMPortDeviceImpl&>(*child);
    if (device.m_infoDevice) device.m_infoDevice->m_pParent.ClearIfNaming(this);
  }
}

void CZKUMHubPortImpl::OwnLines(std::u16string& out, const std::u16string& indent) const {
  AppendLineOf(out, indent, u"HubPort ", platform::Decimal(static_cast<std::int32_t>(m_nPortIndex)),
               u":");
  // Everything but 0 and 1 is called bad, an unconfigured device too. This is deliberate.
  AppendLine(out, indent, u"status : ",
             m_nStatus == KPortEmpty       ? u"no device connected"
             : m_nStatus == KPortConnected ? u"device connected"
                                           : u"bad device");
}

}  // namespace KelvoUHW
