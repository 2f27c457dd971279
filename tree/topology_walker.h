// The USB walk: host controllers, their root hubs, every port of every hub, and what hangs on them.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <unordered_set>
#include <vector>

#include "devinfo/device_answers.h"
#include "platform/host.h"
#include "records/device_node_record.h"
#include "records/devnode.h"
#include "records/node.h"
#include "records/records.h"

namespace KelvoUHW {

// Walks and keeps three trees: the one being built, the published one, and the one that was
// published when the build started. Not thread-safe, except that any thread may copy m_current. A
// walk blocks on the drivers. A driver that fails costs the object concerned and nothing else; only
// lack of memory is reported, as std::bad_alloc.
class CZKUMTopologyWalker {
 public:
  explicit CZKUMTopologyWalker(platform::Host& host) noexcept
      : m_host(host), m_answers(host), m_freshNodes(host, m_answers) {}

  // What has been asked since the latest walk started. Whatever else a build asks about
  // device-manager nodes it asks there.
  DeviceAnswers& Answers() noexcept { return m_answers; }

  // Starts a new tree and walks: the names \\.\HCD0 to \\.\HCD9, then the device interfaces, then
  // the device manager.
  void StartWalk();
  // The tree being built becomes the published one.
  void Commit() noexcept;
  // The tree being built is dropped.
  void Abort() noexcept { m_building.Reset(); }

  std::uint32_t m_nConnectedDevices = 0;  // ports with a connected device, of the latest walk
  std::uint32_t m_nConnectedHubs = 0;     // ports whose device is a hub
  NodePtr m_building;
  NodePtr m_previous;
  NodePtr m_current;
  std::vector<DeviceNodeRecord> m_deviceRecords;

  // The steps of a walk. `handle` is open and stays the caller's. AddHostController is true when
  // the controller is new; AddRootHub is true when it could be identified, with its hub or without.
  bool AddHostController(platform::FileHandle handle, const std::u16string& name);
  bool AddRootHub(const RingPtr<CZKUMHostControllerImpl>& controller, platform::FileHandle handle);
  // A hub with everything below it; empty when it does not open or answer. Takes the connection
  // record (null for a root hub) when a hub results and leaves it to the caller otherwise.
  NodePtr BuildHub(const std::u16string& symbolicName,
                   std::unique_ptr<ConnectionRecord>& connectionInfo,
                   const std::u16string& description);

 private:
  // A hub whose ports are being enumerated; its handle is open until the last port is done.
  struct HubOnTheWay;
  using HubPath = std::vector<std::unique_ptr<HubOnTheWay>>;

  void AddLegacyControllers();
  // Fills m_deviceRecords and adds the nodes of its PCI devices.
  void ReadDeviceManagerTree();
  void AddInterfaceControllers();
  void OpenController(const std::u16string& path);
  bool OpenHub(HubPath& path, const std::u16string& symbolicName,
               std::unique_ptr<ConnectionRecord>& connectionInfo,
               const std::u16string& description);
  NodePtr EnumeratePorts(HubPath& path);
  void BuildPort(HubPath& path, std::uint32_t index);

  platform::Host& m_host;
  DeviceAnswers m_answers;
  FreshDeviceManager m_freshNodes;
  DriverKeyIndex& DriverKeys();

  std::optional<DriverKeyIndex> m_driverKeys;  // of the running walk
  std::uint32_t m_nPorts = 0;                  // of the running walk
  // Paths of the hubs met in the running walk, lower-cased.
  std::unordered_set<std::u16string> m_hubPaths;
};

}  // namespace KelvoUHW
