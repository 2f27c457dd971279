#include "tests/support/random_pc.h"

#include <algorithm>
#include <stdexcept>
#include <utility>

#include "bench/plugs.h"
#include "platform/setup_api.h"
#include "platform/text.h"

namespace testing_support {
namespace {

namespace simulated = platform::simulated;
using namespace platform::simulated;
using KelvoUHW::AddNode;
using KelvoUHW::DriverKey;

Text SerialOf(const Gadget& gadget) { return gadget.id.substr(gadget.id.rfind(u'\\') + 1); }

// Several volumes of one disk: the first as Windows names it, the others with something behind it.
Text VolumeId(const Text& diskId, const Text& name) {
  return KelvoUHW::VolumeId(diskId, name.substr(name.size() - 3, 1));
}

// A volume that is mounted nowhere.
void AddVolume(simulated::Plug& plug, const Text& diskId, const Text& name) {
  const Text id = VolumeId(diskId, name);
  AddNode(plug, id, KelvoUHW::kVolumeManagerId, u"Volume", u"volume");
  plug.fragment.devices.back().physicalName = u"\\Device\\Volume" + name.substr(name.size() - 10, 8);
  KelvoUHW::AddStorageInterface(plug, platform::GUID_DEVINTERFACE_VOLUME, id, diskId);
  plug.fragment.volumes.push_back({name, id, {}, 7, platform::kDRIVE_REMOVABLE, false, {}});
}

// Everything a gadget brings; the result says what stands on its port.
Port AddGadget(simulated::Plug& plug, const Gadget& gadget, const Text& hubDevice) {
  static constexpr const char16_t* kServices[kKinds] = {u"HidUsb", u"HidUsb", u"USBSTOR", u"usbccgp",
                                                        u"STHDA",  u"usbhub", u"USBSTOR"};
  AddNode(plug, gadget.id, hubDevice, u"USB", kServices[static_cast<std::size_t>(gadget.kind)]);
  const Text serial = SerialOf(gadget);
  if (gadget.kind == Kind::Mouse) AddNode(plug, u"HID\\VID_046D\\" + serial, gadget.id, u"Mouse", u"mouhid");
  if (gadget.kind == Kind::Keyboard) AddNode(plug, u"HID\\VID_413C\\" + serial, gadget.id, u"Keyboard", u"kbdhid");
  if (gadget.kind == Kind::Composite) {
    for (const Text function : {u"VID_1&PID_2&MI_00\\", u"VID_1&PID_2&MI_01\\"}) {
      AddNode(plug, u"USB\\" + function + serial, gadget.id, u"HIDClass", u"HidUsb");
      AddNode(plug, u"HID\\" + function + serial, u"USB\\" + function + serial, u"Keyboard", u"kbdhid");
    }
  }
  if (gadget.kind == Kind::Hub) {
    plug.fragment.hubs.push_back({HubName(gadget.id), std::vector<Port>(4), false});
    return HubOnPort(DriverKey(gadget.id), HubName(gadget.id));
  }
  for (std::size_t disk = 0; disk < gadget.disks.size(); ++disk) {
    KelvoUHW::AddDisk(plug, DiskId(gadget, disk), gadget.id);
    for (const Text& name : gadget.disks[disk]) AddVolume(plug, DiskId(gadget, disk), name);
  }
  return DevicePort(DriverKey(gadget.id), 0x0781, 0x5580);
}

// Half of the PCs have root hubs whose service is reported, as newer systems have.
Machine EmptyPc(std::uint32_t controllers, bool reportedHubs) {
  simulated::Plug parts;
  AddNode(parts, u"ACPI\\PNP0A08\\0", u"", u"System", u"pci");
  AddNode(parts, KelvoUHW::kVolumeManagerId, u"", u"System", u"volmgr");
  for (std::uint32_t i = 0; i < controllers; ++i) {
    const Text number = platform::Decimal(static_cast<std::int32_t>(i));
    const Text controller = kControllerId + number, hub = u"USB\\ROOT_HUB20\\4&" + number;
    AddNode(parts, controller, u"ACPI\\PNP0A08\\0", u"USB", u"usbehci");
    AddNode(parts, hub, controller, u"USB", reportedHubs ? KelvoUHW::kNewHubService : KelvoUHW::kOldHubService);
    parts.fragment.hostControllers.push_back({{u"\\\\.\\HCD" + number}, DriverKey(controller), HubName(hub)});
    parts.fragment.hubs.push_back({HubName(hub), std::vector<Port>(4), false});
  }
  return parts.fragment;
}

}  // namespace

Text DiskId(const Gadget& gadget, std::size_t disk) {
  return KelvoUHW::DiskId(SerialOf(gadget), static_cast<std::uint32_t>(disk));
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
  change.port = AddGadget(plug, gadget, hub);
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
    AddVolume(plug, diskId, cards[0]);
    Apply({0, {}, std::move(plug)}, "put a card into", diskId);
  } else {
    Apply({0, {}, simulated::Unplug{VolumeId(diskId, cards[0])}}, "take the card from", diskId);
    cards.clear();
  }
}

void RandomPc::MountOrDismount() {
  const Machine machine = m_pc->Snapshot();
  if (machine.volumes.empty()) return;
  const platform::simulated::Volume& volume =
      machine.volumes[Below(static_cast<std::uint32_t>(machine.volumes.size()))];
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
