#include "tree/topology_walker.h"

#include <utility>

#include "platform/text.h"
#include "records/device_set.h"
#include "records/port_device.h"
#include "tree/device_forest.h"
#include "tree/hub_queries.h"

namespace KelvoUHW {

namespace {

constexpr std::int32_t kLegacyNames = 10;
// Far beyond any PC: hubs that a driver makes up for ever are left there.
constexpr std::size_t kMostHubs = 20'000;

}  // namespace

// A walk is a loop over a path of hubs and not a recursion: how deep hubs are chained is up to the
// hardware, the stack of the calling thread is up to its program.
struct CZKUMTopologyWalker::HubOnTheWay {
  explicit HubOnTheWay(platform::DeviceIo& io) noexcept : file(io) {}

  // A port that is done goes below the hub, and is named after it. Its name is not among those of
  // the ports that are there, so it is not compared with each of them.
  void Add(const RingPtr<CZKUMHubPortImpl>& port) {
    hub->m_childs.push_back(port);
    port->m_pParent = hub.Get();
    port->SetInstanceId(hub->m_strDevInstId + u" port " +
                        platform::Decimal(static_cast<std::int32_t>(port->m_nPortIndex)));
  }

  RingPtr<CZKUMHubDeviceImpl> hub;
  DeviceFile file;
  std::uint32_t nextPort = 1;
  // The port that waits for the hub behind this one on the path.
  RingPtr<CZKUMHubPortImpl> waiting;
};

void CZKUMTopologyWalker::StartWalk() {
  m_answers.Forget();
  m_previous = m_current;
  m_nConnectedDevices = 0;
  m_nConnectedHubs = 0;
  m_nPorts = 0;
  m_building = MakeRecord<CZKUMUsbTreeRootImpl>();
  m_driverKeys.reset();
  m_hubPaths.clear();
  AddLegacyControllers();
  AddInterfaceControllers();
  ReadDeviceManagerTree();
  m_driverKeys.reset();
  m_hubPaths.clear();
}

DriverKeyIndex& CZKUMTopologyWalker::DriverKeys() {
  return m_driverKeys ? *m_driverKeys : m_driverKeys.emplace(m_freshNodes);
}

void CZKUMTopologyWalker::ReadDeviceManagerTree() {
  m_deviceRecords.clear();
  m_deviceRecords = ReadDeviceForest(m_host, m_answers);
  AddForestNodes(m_deviceRecords, *m_building);
}

void CZKUMTopologyWalker::Commit() noexcept {
  m_current = m_building;
  m_building.Reset();
}

void CZKUMTopologyWalker::AddLegacyControllers() {
  for (std::int32_t number = 0; number < kLegacyNames; ++number) {
    OpenController(u"\\\\.\\HCD" + platform::Decimal(number));
  }
}

void CZKUMTopologyWalker::AddInterfaceControllers() {
  // The all-zero class is no controller's class, so this source finds nothing on an ordinary PC.
  // Deliberate: the interface class of host controllers would bring each of them in a second time.
  DeviceSet set(m_host);
  if (!set.Open(&platform::kNullGuid,
                platform::kDIGCF_PRESENT | platform::kDIGCF_DEVICEINTERFACE)) {
    return;
  }
  for (std::uint32_t index = 0; index < kMostElements; ++index) {
    platform::SP_DEVICE_INTERFACE_DATA data{.cbSize = sizeof data};
    if (!m_host.EnumDeviceInterfaces(set.Get(), platform::kNullGuid, index, data)) return;
    platform::Status status;
    if (const InterfaceDetail detail =
            ReadInterfaceDetail(m_host, set.Get(), data, nullptr, status)) {
      OpenController(detail.DevicePath());
    }
    // The shared query without an element to fill gives nothing, so nothing more is opened. This is
    // deliberate.
    if (const InterfaceDetail more =
            GetInterfaceDetail(m_host, m_host, set.Get(), &data, nullptr)) {
      OpenController(more.DevicePath());
    }
  }
}

void CZKUMTopologyWalker::OpenController(const std::u16string& path) {
  DeviceFile file(m_host);
  if (file.Open(path, platform::kGENERIC_WRITE, platform::kFILE_SHARE_WRITE)) {
    AddHostController(file.Get(), path);
  }
}

bool CZKUMTopologyWalker::AddHostController(platform::FileHandle handle,
                                            const std::u16string& name) {
  if (!m_building) return false;
  const auto controller = MakeRecord<CZKUMHostControllerImpl>();
  controller->m_strDriverKeyName = name;
  if (!ReadDriverKeyName(m_host, handle, *controller)) return false;
  // One controller met under several names is recognised by its driver key and by nothing else.
  if (m_building->HasChildWithDriverKey(controller->m_strDriverKeyName)) return false;
  AddChild(controller, m_building.Get());
  AddRootHub(controller, handle);
  controller->SetLeafName(name);
  return true;
}

bool CZKUMTopologyWalker::AddRootHub(const RingPtr<CZKUMHostControllerImpl>& controller,
                                     platform::FileHandle handle) {
  if (!Initialise(m_host, m_answers, DriverKeys(), handle, *controller)) return false;
  std::unique_ptr<ConnectionRecord> none;
  if (NodePtr hub = BuildHub(controller->m_strRootHubName, none, u"RootHub")) {
    AddChild(hub, controller.Get());
  }
  return true;
}

NodePtr CZKUMTopologyWalker::BuildHub(const std::u16string& symbolicName,
                                      std::unique_ptr<ConnectionRecord>& connectionInfo,
                                      const std::u16string& description) {
  HubPath path;
  if (!OpenHub(path, symbolicName, connectionInfo, description)) return {};
  return EnumeratePorts(path);
}

bool CZKUMTopologyWalker::OpenHub(HubPath& path, const std::u16string& symbolicName,
                                  std::unique_ptr<ConnectionRecord>& connectionInfo,
                                  const std::u16string& description) {
  auto entry = std::make_unique<HubOnTheWay>(m_host);
  entry->hub = MakeRecord<CZKUMHubDeviceImpl>();
  CZKUMHubDeviceImpl& hub = *entry->hub;
  hub.SetHubName(symbolicName);
  // A hub hangs in one place. A driver that names it in several, or below itself, would make the
  // walk as long as it likes.
  std::u16string loweredPath = platform::ToLower(hub.m_strPathName);
  if (m_hubPaths.size() >= kMostHubs || m_hubPaths.contains(loweredPath)) return false;
  if (!entry->file.Open(hub.m_strPathName, platform::kGENERIC_WRITE, platform::kFILE_SHARE_WRITE) ||
      !GetNodeInformation(m_host, entry->file.Get(), hub.m_nodeInformation)) {
    return false;
  }
  m_hubPaths.insert(std::move(loweredPath));
  if (connectionInfo) hub.SetConnectionInfo(std::move(connectionInfo), nullptr, nullptr);
  if (!description.empty()) hub.m_strDeviceDescr = description;
  path.push_back(std::move(entry));
  return true;
}

NodePtr CZKUMTopologyWalker::EnumeratePorts(HubPath& path) {
  for (;;) {
    HubOnTheWay& here = *path.back();
    if (here.nextPort <= here.hub->NumberOfPorts() && m_nPorts < kMostElements) {
      ++m_nPorts;
      BuildPort(path, here.nextPort++);
      continue;
    }
    NodePtr done = here.hub;
    path.pop_back();
    if (path.empty()) return done;
    HubOnTheWay& above = *path.back();
    const RingPtr<CZKUMHubPortImpl> port = std::move(above.waiting);
    port->m_nStatus = KPortConnected;
    AddChild(done, port.Get());
    above.Add(port);
  }
}

void CZKUMTopologyWalker::BuildPort(HubPath& path, std::uint32_t index) {
  HubOnTheWay& here = *path.back();
  const platform::FileHandle hub = here.file.Get();
  auto record = std::make_unique<ConnectionRecord>();
  platform::USB_NODE_CONNECTION_INFORMATION_EX& info = record->Info;
  info.ConnectionIndex = index;
  const auto port = MakeRecord<CZKUMHubPortImpl>(index);

  std::u16string driverKey;
  std::u16string description;
  std::u16string instanceId;
  platform::DevInst node = 0;
  // A port that does not answer the probe is never asked with the older request; its record stays
  // zero and reads as a port without device.
  if (ProbeConnectionInformationEx(m_host, hub, index)) {
    if (!GetConnectionInformation(m_host, hub, index, *record)) return;
    if (info.ConnectionStatus == platform::DeviceConnected) ++m_nConnectedDevices;
    if (info.DeviceIsHub != 0) ++m_nConnectedHubs;
    if (info.ConnectionStatus != platform::NoDeviceConnected) {
      driverKey = GetConnectionDriverKeyName(m_host, hub, index);
      if (!driverKey.empty()) {
        node = DriverKeys().Find(driverKey);
        description = GetDeviceDescription(m_host, node);
        instanceId = GetDeviceId(m_answers, node);
      }
    }
    if (info.DeviceIsHub != 0) {
      const std::u16string name = GetConnectionName(m_host, hub, index);
      if (!name.empty() && OpenHub(path, name, record, description)) {
        here.waiting = port;  // `here` stays where it is: the path holds pointers
      } else {
        here.Add(port);
      }
      return;
    }
  }
  if (info.ConnectionStatus != platform::NoDeviceConnected) {
    port->m_nStatus = info.CurrentConfigurationValue == 0 ? KPortUnconfigured : KPortConnected;
    AddChild(MakeRecord<CZKUMPortDeviceImpl>(node, std::move(record), nullptr, nullptr,
                                             std::move(driverKey), std::move(description),
                                             std::move(instanceId)),
             port.Get());
  }
  here.Add(port);
}

}  // namespace KelvoUHW
