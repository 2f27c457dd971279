#include "simulation/machine/suspicions.h"

#include <algorithm>
#include <string_view>
#include <unordered_map>
#include <utility>

#include "platform/host.h"
#include "platform/text.h"
#include "simulation/machine/json_reader.h"
#include "simulation/machine/machine_index.h"
#include "simulation/machine/steps.h"

namespace platform::simulated {
namespace {

std::string At(const char* section, std::size_t index) {
  return std::string(section) + "[" + std::to_string(index) + "]";
}

// The id of a hub's device, by the hub's symbolic name.
Text HubDevice(const Text& name) {
  return Replaced(name.substr(0, name.rfind(u"#{")), u'\\', u'#');
}

bool IsPortLocation(const Text& location) {
  return location.starts_with(u"Port_#") && location.find(u".Hub_#") != Text::npos;
}

class Search {
 public:
  explicit Search(const Machine& machine) : m_machine(machine) {
    for (const Device& device : machine.devices) {
      m_symbolicIds.Add(Replaced(Replaced(device.id, u'\\', u'#'), u'/', u'#'));
      if (device.driver) m_drivers.try_emplace(ToLower(*device.driver), &device);
    }
    for (const Hub& hub : machine.hubs) m_hubs.Add(hub.name);
    for (const Interface& entry : machine.interfaces) m_paths.Add(entry.path);
    for (const Volume& volume : machine.volumes) {
      m_volumes.Add(volume.name);
      for (const Text& path : volume.paths) m_roots.Add(path);
    }
    for (const Drive& drive : machine.drives) m_letters.Add(Text(1, drive.letter));
  }

  std::vector<std::string> Run() {
    Devices();
    Controllers();
    Hubs();
    StoragePaths();
    Volumes();
    Drives();
    return std::move(m_found);
  }

 private:
  void Find(const std::string& place, const std::string& reason) {
    m_found.push_back(place + ": " + reason);
  }

  const Device* ByDriver(const Text& key) const {
    const auto found = m_drivers.find(ToLower(key));
    return found == m_drivers.end() ? nullptr : found->second;
  }

  void Devices() {
    std::unordered_map<Text, std::size_t> drivers;
    std::unordered_map<Text, std::size_t> places;
    for (std::size_t i = 0; i < m_machine.devices.size(); ++i) {
      const Device& device = m_machine.devices[i];
      const std::string place = At("devices", i);
      if (device.driver) {
        const auto [first, fresh] = drivers.try_emplace(ToLower(*device.driver), i);
        if (!fresh) {
          Find(place + ".driver", "the driver key of " + At("devices", first->second) +
                                      ", which is the one that is found by it");
        }
      }
      // The functions of a composite device have its place and are not below the hub.
      if (device.location && IsPortLocation(*device.location)) {
        const auto [first, fresh] =
            places.try_emplace(ToLower(device.parent) + u" " + ToLower(*device.location), i);
        if (!fresh) Find(place + ".location", "on one port with " + At("devices", first->second));
      }
      if (device.noParent) {
        Find(place + ".noParent", "with it nothing of the device manager is shown");
      }
    }
  }

  void DriverKey(const std::optional<Text>& key, const std::string& place) {
    if (key && !key->empty() && ByDriver(*key) == nullptr) {
      Find(place + ".driverKey", "no device has the driver key " + Quoted(*key));
    }
  }

  void Controllers() {
    for (std::size_t i = 0; i < m_machine.hostControllers.size(); ++i) {
      const HostController& controller = m_machine.hostControllers[i];
      const std::string place = At("hostControllers", i);
      const bool opens = std::any_of(controller.names.begin(), controller.names.end(), IsOpened);
      if (!opens) Find(place + ".names", "nobody opens it: none is \\\\.\\HCD0 to \\\\.\\HCD9");
      if (!controller.driverKey) Find(place, "without driverKey it is not shown");
      DriverKey(controller.driverKey, place);
      if (!controller.rootHub) {
        Find(place, "without rootHub it shows no ports");
      } else if (!m_hubs.Has(*controller.rootHub)) {
        Find(place + ".rootHub", "no hub with the name " + Quoted(*controller.rootHub));
      }
      if (controller.rootHub) NameHub(*controller.rootHub, place + ".rootHub");
      if (const Device* device = controller.driverKey ? ByDriver(*controller.driverKey) : nullptr) {
        ControllerDevice(*device, place);
      }
    }
  }

  static bool IsOpened(const Text& name) {
    return name.size() == 8 && ToLower(std::u16string_view(name)).starts_with(u"\\\\.\\hcd") &&
           name[7] >= u'0' && name[7] <= u'9';
  }

  void ControllerDevice(const Device& device, const std::string& place) {
    for (const std::u16string_view part : {u"VEN_", u"DEV_", u"SUBSYS_", u"REV_"}) {
      if (device.id.find(part) != Text::npos) continue;
      Find(place,
           "shows no ports: the id " + Quoted(device.id) + " of its device lacks " + ToUtf8(part));
      return;
    }
    if (!device.description || device.description->empty()) {
      Find(place, "shows no ports: its device " + Quoted(device.id) + " has no description");
    }
  }

  void NameHub(const Text& name, const std::string& place) {
    const auto [first, fresh] = m_named.try_emplace(ToLower(name), place);
    if (!fresh) {
      Find(place, "the hub " + Quoted(name) + " is named by " + first->second + " already");
    }
  }

  void Hubs() {
    std::unordered_map<Text, std::string> sockets;
    for (std::size_t i = 0; i < m_machine.hubs.size(); ++i) {
      for (std::size_t j = 0; j < m_machine.hubs[i].ports.size(); ++j) {
        const Port& port = m_machine.hubs[i].ports[j];
        const std::string place = At("hubs", i) + "." + At("ports", j);
        DriverKey(port.driverKey, place);
        if (port.driverKey) {
          const auto [first, fresh] = sockets.try_emplace(ToLower(*port.driverKey), place);
          if (!fresh) Find(place + ".driverKey", "its device is on " + first->second + " already");
        } else if (port.status == DeviceConnected) {
          Find(place, "a connected device without driverKey has no name and no volumes");
        }
        if (!port.hubName) continue;
        NameHub(*port.hubName, place + ".hubName");
        if (!m_hubs.Has(*port.hubName)) {
          Find(place + ".hubName", "no hub with the name " + Quoted(*port.hubName));
        }
      }
    }
    for (std::size_t i = 0; i < m_machine.hubs.size(); ++i) {
      const Text& name = m_machine.hubs[i].name;
      if (!m_named.contains(ToLower(name)))
        Find(At("hubs", i), "no controller and no port names it");
      if (!m_symbolicIds.Has(HubDevice(name))) {
        Find(At("hubs", i) + ".name", "no device with such an id, so it never goes");
      }
    }
  }

  void StoragePaths() {
    for (std::size_t i = 0; i < m_machine.storage.size(); ++i) {
      const Text& path = m_machine.storage[i].path;
      const bool isDrive = IsDriveName(ToLower(std::u16string_view(path)));
      if (isDrive ? m_letters.Has(path.substr(4, 1)) : m_paths.Has(path)) continue;
      Find(At("storage", i) + ".path",
           isDrive ? "no drive with that letter" : "no interface with the path " + Quoted(path));
    }
  }

  void Volumes() {
    for (std::size_t i = 0; i < m_machine.volumes.size(); ++i) {
      const Volume& volume = m_machine.volumes[i];
      const std::string place = At("volumes", i);
      if (volume.device.empty()) Find(place, "without device no interface leads to it");
      for (std::size_t j = 0; j < volume.paths.size(); ++j) {
        const Text& path = volume.paths[j];
        if (!IsDriveRoot(path.substr(0, 3)) || m_letters.Has(path.substr(0, 1))) continue;
        Find(place + "." + At("paths", j), "no drive with that letter");
      }
      for (std::size_t j = 0; j < volume.folderMounts.size(); ++j) {
        const Text& mounted = volume.folderMounts[j].volume;
        if (m_volumes.Has(mounted)) continue;
        Find(place + "." + At("folderMounts", j) + ".volume", "no volume " + Quoted(mounted));
      }
    }
  }

  // An empty slot of a card reader and a CD drive without a disc have a device and no volume.
  void Drives() {
    for (std::size_t i = 0; i < m_machine.drives.size(); ++i) {
      const Drive& drive = m_machine.drives[i];
      if (m_roots.Has(Text(1, drive.letter) + u":\\")) continue;
      const bool mayBeEmpty = drive.type == kDRIVE_REMOVABLE && !drive.device.empty();
      if (drive.type == kDRIVE_FIXED || (drive.type == kDRIVE_REMOVABLE && !mayBeEmpty)) {
        Find(At("drives", i), "no volume names " + ToUtf8(Text(1, drive.letter)) + ":\\");
      }
    }
  }

  const Machine& m_machine;
  std::unordered_map<Text, const Device*> m_drivers;
  NameSet m_symbolicIds;
  NameSet m_hubs;
  NameSet m_paths;
  NameSet m_volumes;
  NameSet m_roots;
  NameSet m_letters;
  std::unordered_map<Text, std::string> m_named;  // hubs, by what names them
  std::vector<std::string> m_found;
};

}  // namespace

std::vector<std::string> Suspicions(const Machine& machine) { return Search(machine).Run(); }

}  // namespace platform::simulated
