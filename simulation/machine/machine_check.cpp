#include "simulation/machine/machine_check.h"

#include <unordered_map>

#include "platform/text.h"
#include "simulation/machine/json_reader.h"

namespace platform::simulated {
namespace {

// The names of one kind, without regard to case, each with the place that brought it.
class Names {
 public:
  // `what` stands in the message: "device with the id".
  Names(const char* what, const FileReport& file) : m_what(what), m_file(file) {}

  void AddPresent(const Text& name) { m_places.emplace(ToLower(name), "there already"); }

  void Add(const Text& name, const std::string& owner, const std::string& place) {
    if (name.empty()) return;
    const auto [entry, fresh] = m_places.emplace(ToLower(name), owner);
    if (fresh) return;
    m_file.Try([&, &first = entry->second] {
      FailAt(
          m_file, place,
          std::string("a second ") + m_what + " " + Quoted(name) + " (the first is " + first + ")");
    });
  }

  void MustHave(const Text& name, const std::string& place) const {
    if (name.empty() || m_places.contains(ToLower(name))) return;
    m_file.Try([&] { FailAt(m_file, place, std::string("no ") + m_what + " " + Quoted(name)); });
  }

 private:
  const char* m_what;
  const FileReport& m_file;
  std::unordered_map<Text, std::string> m_places;
};

class Checker {
 public:
  Checker(const Machine& there, const Machine& added, const FileReport& file,
          const std::string& prefix)
      : m_there(there), m_added(added), m_file(file), m_prefix(prefix) {}

  void Run() {
    CheckDevices();
    CheckCircles();
    CheckOnce("interfaces", ".path", "interface with the path", &Machine::interfaces,
              &Interface::path);
    CheckControllers();
    CheckOnce("hubs", ".name", "hub with the name", &Machine::hubs, &Hub::name);
    CheckOnce("storage", ".path", "entry with the path", &Machine::storage, &Storage::path);
    CheckOnce("volumes", ".name", "volume with the name", &Machine::volumes, &Volume::name);
    CheckPaths();
    CheckLetters();
    CheckOwners();
  }

 private:
  std::string At(const char* section, std::size_t index) const {
    return m_prefix + section + "[" + std::to_string(index) + "]";
  }

  template <class Record>
  void CheckOnce(const char* section, const char* member, const char* what,
                 std::vector<Record> Machine::*records, Text Record::*name) const {
    Names names(what, m_file);
    for (const Record& record : m_there.*records) names.AddPresent(record.*name);
    for (std::size_t i = 0; i < (m_added.*records).size(); ++i) {
      const std::string place = At(section, i);
      names.Add((m_added.*records)[i].*name, place, place + member);
    }
  }

  void CheckDevices() {
    for (const Device& device : m_there.devices) m_devices.AddPresent(device.id);
    for (std::size_t i = 0; i < m_added.devices.size(); ++i) {
      const Text& id = m_added.devices[i].id;
      const std::string place = At("devices", i);
      if (EqualIgnoringCase(id, kRootDeviceId)) {
        m_file.Try(
            [&] { FailAt(m_file, place + ".id", "is the root device, which is always there"); });
        continue;
      }
      m_devices.Add(id, place, place + ".id");
    }
    for (std::size_t i = 0; i < m_added.devices.size(); ++i) {
      const Text& parent = m_added.devices[i].parent;
      if (parent.empty() || EqualIgnoringCase(parent, kRootDeviceId)) continue;
      m_devices.MustHave(parent, At("devices", i) + ".parent");
    }
  }

  // Only newcomers can form a circle: what is there already has its parents there.
  void CheckCircles() const {
    constexpr std::size_t kNone = static_cast<std::size_t>(-1);
    const std::vector<Device>& devices = m_added.devices;
    std::unordered_map<Text, std::size_t> indexes;
    for (std::size_t i = 0; i < devices.size(); ++i) indexes.emplace(ToLower(devices[i].id), i);
    std::vector<std::size_t> reachedFrom(devices.size(), kNone);
    for (std::size_t start = 0; start < devices.size(); ++start) {
      std::size_t node = start;
      while (node != kNone && reachedFrom[node] == kNone) {
        reachedFrom[node] = start;
        const auto parent = indexes.find(ToLower(devices[node].parent));
        node = parent == indexes.end() ? kNone : parent->second;
      }
      if (node != kNone && reachedFrom[node] == start) {
        m_file.Try([&] {
          FailAt(m_file, At("devices", node) + ".parent",
                 "the parents of this device form a circle");
        });
      }
    }
  }

  void CheckControllers() const {
    Names names("controller with the name", m_file);
    for (const HostController& controller : m_there.hostControllers) {
      for (const Text& name : controller.names) names.AddPresent(name);
    }
    for (std::size_t i = 0; i < m_added.hostControllers.size(); ++i) {
      const std::string controller = At("hostControllers", i);
      std::size_t index = 0;
      for (const Text& name : m_added.hostControllers[i].names) {
        names.Add(name, controller, controller + ".names[" + std::to_string(index++) + "]");
      }
    }
  }

  void CheckPaths() const {
    Names names("volume with the path name", m_file);
    for (const Volume& volume : m_there.volumes) {
      for (const Text& path : volume.paths) names.AddPresent(path);
    }
    for (std::size_t i = 0; i < m_added.volumes.size(); ++i) {
      const std::string volume = At("volumes", i);
      std::size_t index = 0;
      for (const Text& path : m_added.volumes[i].paths) {
        names.Add(path, volume, volume + ".paths[" + std::to_string(index++) + "]");
      }
    }
  }

  void CheckLetters() const {
    Names letters("drive with the letter", m_file);
    for (const Drive& drive : m_there.drives) letters.AddPresent(Text(1, drive.letter));
    for (std::size_t i = 0; i < m_added.drives.size(); ++i) {
      const std::string place = At("drives", i);
      letters.Add(Text(1, m_added.drives[i].letter), place, place + ".letter");
    }
  }

  void CheckOwners() const {
    for (std::size_t i = 0; i < m_added.interfaces.size(); ++i) {
      m_devices.MustHave(m_added.interfaces[i].device, At("interfaces", i) + ".device");
    }
    for (std::size_t i = 0; i < m_added.volumes.size(); ++i) {
      const Text& device = m_added.volumes[i].device;
      if (!device.empty()) m_devices.MustHave(device, At("volumes", i) + ".device");
    }
    for (std::size_t i = 0; i < m_added.drives.size(); ++i) {
      const Text& device = m_added.drives[i].device;
      if (!device.empty()) m_devices.MustHave(device, At("drives", i) + ".device");
    }
  }

  const Machine& m_there;
  const Machine& m_added;
  const FileReport& m_file;
  const std::string& m_prefix;
  Names m_devices{"device with the id", m_file};
};

}  // namespace

void CheckMachine(const Machine& there, const Machine& added, const FileReport& file,
                  const std::string& prefix) {
  Checker(there, added, file, prefix).Run();
}

}  // namespace platform::simulated
