#include "tools/zkusb/device_facts.h"

#include <algorithm>

#include "platform/text.h"
#include "tools/zkusb/device_texts.h"
#include "tools/zkusb/writer.h"

namespace zkusb {

namespace {

void CollectDevices(const NodeView& node, Place& place, std::vector<PlacedDevice>& found) {
  if (node.Type == KUDTPortDevice) {
    found.push_back({&node, place});
    return;
  }
  const bool isPort = node.Type == KUDTHubPort;
  if (isPort) place.ports.push_back(node.PortIndex);
  for (const NodeView& child : node.Childs) CollectDevices(child, place, found);
  if (isPort) place.ports.pop_back();
}

constexpr std::size_t kNoDisk = static_cast<std::size_t>(-1);

class DiskCollector {
 public:
  void Visit(const NodeView& node, std::size_t disk) {
    for (const NodeView& child : node.Childs) {
      if (child.Storage) {
        AddStorage(child, *child.Storage, disk);
        Visit(child, disk);
      } else {
        Visit(child, IsDisk(child) ? AddDisk(child) : disk);
      }
    }
  }
  std::vector<Disk> Take() {
    for (Disk& disk : m_disks) {
      if (disk.name.empty()) disk.name = u"without name";
    }
    return std::move(m_disks);
  }

 private:
  static bool IsDisk(const NodeView& node) {
    return node.Info && platform::EqualIgnoringCase(node.Info->DevClass, u"DiskDrive");
  }

  std::size_t FindOrAdd(const std::u16string& id) {
    const auto found = std::find_if(m_disks.begin(), m_disks.end(),
                                    [&](const Disk& disk) { return disk.id == id; });
    if (found != m_disks.end()) return static_cast<std::size_t>(found - m_disks.begin());
    m_disks.emplace_back().id = id;
    return m_disks.size() - 1;
  }

  std::size_t AddDisk(const NodeView& node) {
    const std::size_t disk = FindOrAdd(node.InstanceId);
    m_disks[disk].name = Tidied(node.Info->FriendlyName);
    if (m_disks[disk].name.empty()) m_disks[disk].name = Tidied(node.Description);
    return disk;
  }

  // An interface device is a disk under the disk's own id, or a volume below its disk.
  void AddStorage(const NodeView& node, const StorageView& storage, std::size_t disk) {
    const bool isVolume = !storage.VolumeName.empty();
    if (!isVolume || disk == kNoDisk) disk = FindOrAdd(node.InstanceId);
    Disk& entry = m_disks[disk];
    entry.hasInterface = true;
    if (entry.name.empty()) {
      entry.name = Joined({Tidied(storage.VendorId), Tidied(storage.ProductId)}, u" ");
    }
    if (isVolume) {
      entry.volumes.push_back(&storage);
    } else {
      entry.mountPoints.insert(entry.mountPoints.end(), storage.MountPoints.begin(),
                               storage.MountPoints.end());
    }
  }

  std::vector<Disk> m_disks;
};

}  // namespace

std::u16string PortPath(const Place& place) {
  std::u16string path;
  if (place.controller == 0) return path;
  path = platform::Decimal(static_cast<std::int32_t>(place.controller));
  char16_t before = u'-';
  for (const std::int32_t port : place.ports) {
    // What the device manager's storage controllers have instead of ports.
    if (port == 0) continue;
    path += before;
    path += platform::Decimal(port);
    before = u'.';
  }
  return path;
}

std::vector<PlacedDevice> PortDevices(const NodeView& root) {
  std::vector<PlacedDevice> found;
  Place place;
  for (const NodeView& child : root.Childs) {
    ++place.controller;
    CollectDevices(child, place, found);
  }
  return found;
}

bool IsUsbController(const NodeView& controller) {
  // Only a controller that was opened has the name under which it was.
  return controller.Type == KUDTHostController && !controller.LeafName.empty();
}

bool HasUsbController(const NodeView& root) {
  return std::any_of(root.Childs.begin(), root.Childs.end(), [](const NodeView& controller) {
    return IsUsbController(controller) && !controller.Childs.empty();
  });
}

std::vector<Disk> DisksOf(const NodeView& device) {
  DiskCollector collector;
  collector.Visit(device, kNoDisk);
  return collector.Take();
}

bool CarriesStorage(const NodeView& device) {
  return std::any_of(device.Childs.begin(), device.Childs.end(),
                     [](const NodeView& child) { return child.Storage || CarriesStorage(child); });
}

std::vector<std::u16string> MountPointsOf(const NodeView& device) {
  std::vector<std::u16string> all;
  for (const Disk& disk : DisksOf(device)) {
    all.insert(all.end(), disk.mountPoints.begin(), disk.mountPoints.end());
    for (const StorageView* volume : disk.volumes) {
      all.insert(all.end(), volume->MountPoints.begin(), volume->MountPoints.end());
    }
  }
  return all;
}

std::vector<std::u16string> DriveLetters(const std::vector<std::u16string>& mountPoints) {
  std::vector<std::u16string> letters;
  for (const std::u16string& text : mountPoints) {
    if (text.size() == 3 && text.ends_with(u":\\")) letters.push_back(text.substr(0, 2));
  }
  return letters;
}

}  // namespace zkusb
