#include "tests/support/random_pc.h"

#include <algorithm>
#include <stdexcept>
#include <utility>

#include "platform/setup_api.h"
#include "platform/text.h"
#include "tests/support/machines.h"

namespace testing_support {
namespace {

namespace simulated = platform::simulated;
using namespace platform::simulated;

constexpr char16_t kVolumeManager[] = u"ROOT\\VOLMGR\\0000";
constexpr char16_t kDiskClassText[] = u"#{53f56307-b6bf-11d0-94f2-00a0c91efb8b}";
constexpr char16_t kVolumeClassText[] = u"#{53f5630d-b6bf-11d0-94f2-00a0c91efb8b}";

Text DiskPath(const Text& diskId) { return u"\\\\?\\" + platform::Replaced(diskId, u'\\', u'#') + kDiskClassText; }

// Several volumes of one disk: the first as Windows names it, the others with something behind it.
Text VolumeId(const Text& diskId, const Text& volumeName) {
  const Text id = u"STORAGE\\VOLUME\\_??_" + platform::Replaced(diskId, u'\\', u'#') + kDiskClassText +
                  volumeName.substr(volumeName.size() - 3, 1);
  return platform::ToUpper(id);
}

void AddNode(Machine& machine, const Text& id, const Text& parent, const Text& deviceClass, const Text& service) {
  const Text driver = u"{" + deviceClass + u"}\\" + id.substr(id.find(u'\\') + 1);
  machine.devices.push_back(DeviceNode(id, parent, deviceClass, driver, service + u" device"));
  machine.devices.back().service = service;
}

void AddStorage(Machine& machine, const platform::Guid& interfaceClass, const Text& path, const Text& device) {
  machine.interfaces.push_back({interfaceClass, path, device});
  Storage storage;
  storage.path = path;
  storage.deviceType = std::uint8_t{0};
  storage.removable = true;
  machine.storage.push_back(storage);
}

void AddVolume(Machine& machine, const Text& diskId, const Text& name) {
  const Text id = VolumeId(diskId, name);
  AddNode(machine, id, kVolumeManager, u"Volume", u"volume");
  machine.devices.back().physicalName = u"\\Device\\Volume" + name.substr(name.size() - 10, 8);
  AddStorage(machine, platform::GUID_DEVINTERFACE_VOLUME,
             u"\\\\?\\" + platform::Replaced(id, u'\\', u'#') + kVolumeClassText, id);
  Volume volume;
  volume.name = name;
  volume.device = id;
  volume.serial = 7;
  volume.driveType = platform::kDRIVE_REMOVABLE;
  machine.volumes.push_back(volume);
}

// Everything a gadget brings; the result says what stands on its port.
Port AddGadget(Machine& machine, const Gadget& gadget, const Text& hubDevice) {
  static constexpr const char16_t* kServices[kKinds] = {u"HidUsb", u"HidUsb", u"USBSTOR", u"usbccgp",
                                                        u"STHDA",  u"usbhub", u"USBSTOR"};
  AddNode(machine, gadget.id, hubDevice, u"USB", kServices[static_cast<std::size_t>(gadget.kind)]);
  const Text driver = *machine.devices.back().driver;
  const Text serial = gadget.id.substr(gadget.id.rfind(u'\\') + 1);
  switch (gadget.kind) {
    case Kind::Mouse:
      AddNode(machine, u"HID\\VID_046D\\" + serial, gadget.id, u"Mouse", u"mouhid");
      break;
    case Kind::Keyboard:
      AddNode(machine, u"HID\\VID_413C\\" + serial, gadget.id, u"Keyboard", u"kbdhid");
      break;
    case Kind::Composite:
      for (const Text function : {u"VID_1&PID_2&MI_00\\", u"VID_1&PID_2&MI_01\\"}) {
        AddNode(machine, u"USB\\" + function + serial, gadget.id, u"HIDClass", u"HidUsb");
        AddNode(machine, u"HID\\" + function + serial, u"USB\\" + function + serial, u"Keyboard", u"kbdhid");
      }
      break;
    case Kind::Hub:
      machine.hubs.push_back({HubName(gadget.id), std::vector<Port>(4), false});
      return HubOnPort(driver, HubName(gadget.id));
    case Kind::Unreported:
    case Kind::Stick:
    case Kind::CardReader:
      break;
  }
  for (std::size_t disk = 0; disk < gadget.disks.size(); ++disk) {
    const Text diskId = DiskId(gadget, disk);
    AddNode(machine, diskId, gadget.id, u"DiskDrive", u"disk");
    AddStorage(machine, platform::GUID_DEVINTERFACE_DISK, DiskPath(diskId), diskId);
    for (const Text& name : gadget.disks[disk]) AddVolume(machine, diskId, name);
  }
  return DevicePort(driver, 0x0781, 0x5580);
}

// Half of the PCs have root hubs whose service is reported, as newer systems have.
Machine EmptyPc(std::uint32_t controllers, bool reportedHubs) {
  Machine machine;
  AddNode(machine, u"ACPI\\PNP0A08\\0", u"", u"System", u"pci");
  AddNode(machine, kVolumeManager, u"", u"System", u"volmgr");
  for (std::uint32_t i = 0; i < controllers; ++i) {
    const Text number = platform::Decimal(static_cast<std::int32_t>(i));
    const Text controller = kControllerId + number;
    AddNode(machine, controller, u"ACPI\\PNP0A08\\0", u"USB", u"usbehci");
    const Text driver = *machine.devices.back().driver;
    const Text hub = u"USB\\ROOT_HUB20\\4&" + number;
    AddNode(machine, hub, controller, u"USB", reportedHubs ? u"USBHUB3" : u"usbhub");
    machine.hostControllers.push_back({{u"\\\\.\\HCD" + number}, driver, HubName(hub)});
    machine.hubs.push_back({HubName(hub), std::vector<Port>(4), false});
  }
  return machine;
}

}  // namespace

Text DiskId(const Gadget& gadget, std::size_t disk) {
  return u"USBSTOR\\DISK&VEN_X&PROD_Y\\" + gadget.id.substr(gadget.id.rfind(u'\\') + 1) + u"&" +
         platform::Decimal(static_cast<std::int32_t>(disk));
}

RandomPc::RandomPc(std::uint32_t seed) : m_random(seed) {
  const std::uint32_t controllers = 1 + Below(2);
  m_pc.emplace(EmptyPc(controllers, Below(2) == 0));
}

void RandomPc::Change() {
  const std::uint32_t choice = Below(12);
  if (choice < 3 || m_gadgets.empty()) return AddNewGadget();
  if (choice >= 10) return MountOrDismount();
  Gadget& gadget = m_gadgets[Below(static_cast<std::uint32_t>(m_gadgets.size()))];
  if (choice >= 6) return ChangeCard(gadget);
  const bool moves = gadget.plugged && choice == 5;
  if (gadget.plugged) Unplug(gadget);
  if (moves || choice < 5) Plug(gadget);
}

Text RandomPc::NewVolume() { return u"\\\\?\\Volume{" + platform::HexLower(++m_volumes, 8) + u"}\\"; }

void RandomPc::AddNewGadget() {
  Gadget& gadget = m_gadgets.emplace_back();
  gadget.kind = static_cast<Kind>(Below(kKinds));
  gadget.id = u"USB\\VID_0781&PID_558" + platform::Hex(static_cast<std::uint32_t>(gadget.kind)) + u"\\S" +
              platform::Hex(static_cast<std::uint32_t>(m_gadgets.size()), 4);
  if (gadget.kind == Kind::Stick) {
    gadget.disks.emplace_back(1 + Below(2));
  } else if (gadget.kind == Kind::CardReader) {
    for (std::uint32_t slots = 1 + Below(3); slots > 0; --slots) gadget.disks.emplace_back(Below(2));
  }
  for (auto& disk : gadget.disks) std::ranges::generate(disk, [this] { return NewVolume(); });
  Plug(gadget);
}

void RandomPc::Plug(Gadget& gadget) {
  std::vector<PortChange> free;
  for (const Hub& hub : m_pc->Snapshot().hubs) {
    for (std::uint32_t port = 0; port < hub.ports.size(); ++port) {
      if (hub.ports[port].status == 0) free.push_back({hub.name, port + 1, {}});
    }
  }
  if (free.empty()) return;
  PortChange change = free[Below(static_cast<std::uint32_t>(free.size()))];
  const Text hub = platform::Replaced(change.hub.substr(0, change.hub.rfind(u"#{")), u'#', u'\\');
  simulated::Plug plug;
  change.port = AddGadget(plug.fragment, gadget, hub);
  plug.ports.push_back(std::move(change));
  Apply({0, {}, std::move(plug)}, "plug", gadget.id);
  gadget.plugged = true;
}

// Whatever hangs below goes along.
void RandomPc::Unplug(const Gadget& gadget) {
  Apply({0, {}, simulated::Unplug{gadget.id}}, "unplug", gadget.id);
  const Machine left = m_pc->Snapshot();
  for (Gadget& each : m_gadgets) {
    each.plugged =
        each.plugged && std::ranges::any_of(left.devices, [&](const Device& device) { return device.id == each.id; });
  }
}

void RandomPc::ChangeCard(Gadget& gadget) {
  if (!gadget.plugged || gadget.kind != Kind::CardReader) return;
  const std::size_t slot = Below(static_cast<std::uint32_t>(gadget.disks.size()));
  const Text diskId = DiskId(gadget, slot);
  std::vector<Text>& cards = gadget.disks[slot];
  if (cards.empty()) {
    cards.push_back(NewVolume());
    simulated::Plug plug;
    AddVolume(plug.fragment, diskId, cards[0]);
    Apply({0, {}, std::move(plug)}, "put a card into", diskId);
  } else {
    Apply({0, {}, simulated::Unplug{VolumeId(diskId, cards[0])}}, "take the card from", diskId);
    cards.clear();
  }
}

void RandomPc::MountOrDismount() {
  const Machine machine = m_pc->Snapshot();
  if (machine.volumes.empty()) return;
  const Volume& volume = machine.volumes[Below(static_cast<std::uint32_t>(machine.volumes.size()))];
  if (!volume.paths.empty()) {
    return Apply({0, {}, Dismount{volume.name, volume.paths[0]}}, "dismount", volume.name);
  }
  const char16_t letter = static_cast<char16_t>(u'E' + Below(20));
  const auto isTaken = [&](const Drive& drive) { return drive.letter == letter; };
  if (std::ranges::any_of(machine.drives, isTaken)) return;
  Apply({0, {}, Mount{volume.name, Text(1, letter) + u":\\"}}, "mount", volume.name);
}

void RandomPc::Apply(Step step, const char* what, std::u16string_view which) {
  m_script.append("\n  ").append(what).append(" ").append(platform::ToUtf8(which));
  const Text refused = m_pc->Apply(step);
  if (!refused.empty()) throw std::logic_error(platform::ToUtf8(refused));
}

}  // namespace testing_support
