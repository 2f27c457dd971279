// Random scripts over a small PC: what a build publishes is what is there, and what it reports is
// what changed.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <iostream>
#include <map>
#include <set>

#include "bench/small_pcs.h"
#include "platform/text.h"
#include "records/interface_device.h"
#include "records/records.h"
#include "tests/support/cases.h"
#include "tests/support/random_pc.h"
#include "tree/tree_builder.h"

namespace KelvoUHW {
namespace {

using platform::ToUtf8;
using RandomGadget = testing_support::Gadget;
using RandomKind = testing_support::Kind;
using testing_support::RandomPc;

constexpr int kChangesPerScript = 14;
// The first build meets the last change; then held parents return, one level per build: a slot with
// the second, its reader with the third.
constexpr int kBuildsUntilHeldAreBack = 3;

std::uint32_t FirstSeed() {
  const char* seed = std::getenv("ZKUSB_RANDOM_SEED");
  // The scripts from here on hold a reader that is unplugged while it is held back, and returns with cards.
  return seed == nullptr ? 19'000u : static_cast<std::uint32_t>(std::strtoul(seed, nullptr, 10));
}

// Port devices by instance id, each with where it is plugged in and the volumes below it.
struct Seen {
  std::string port;
  std::set<std::string> volumes;  // the name, then the paths in their order
  friend bool operator==(const Seen&, const Seen&) = default;
};
using Picture = std::map<std::string, Seen>;
using Ids = std::set<std::string>;

void PrintTo(const Seen& seen, std::ostream* out) { *out << seen.port << " " << testing::PrintToString(seen.volumes); }

std::string VolumeText(const std::u16string& name, std::vector<std::u16string> paths) {
  std::ranges::sort(paths);
  std::string text = ToUtf8(name);
  for (const std::u16string& path : paths) text.append(" ").append(ToUtf8(path));
  return text;
}

std::string PortText(const std::u16string& hub, std::uint32_t port) { return ToUtf8(hub) + ":" + std::to_string(port); }

Picture PictureOfPc(const platform::simulated::Machine& machine, const RandomPc& pc) {
  Picture picture;
  for (const auto& hub : machine.hubs) {
    for (std::uint32_t i = 0; i < hub.ports.size(); ++i) {
      const auto device = std::ranges::find_if(machine.devices, [&](const auto& candidate) {
        return hub.ports[i].driverKey && candidate.driver == hub.ports[i].driverKey;
      });
      if (device == machine.devices.end() || hub.ports[i].isHub) continue;
      picture[ToUtf8(device->id)].port = PortText(hub.name, i + 1);
    }
  }
  for (const auto& volume : machine.volumes) {
    for (const RandomGadget& gadget : pc.Gadgets()) {
      for (const auto& disk : gadget.disks) {
        if (std::ranges::find(disk, volume.name) == disk.end()) continue;
        picture[ToUtf8(gadget.id)].volumes.insert(VolumeText(volume.name, volume.paths));
      }
    }
  }
  return picture;
}

Picture PictureOfTree(const NodePtr& root) {
  Picture picture;
  VisitPreOrder(root, [&](const NodePtr& node) {
    if (node->m_nType != KUDTPortDevice) return true;
    const auto& port = static_cast<const CZKUMHubPortImpl&>(*node->m_pParent);
    const auto& hub = static_cast<const CZKUMHubDeviceImpl&>(*port.m_pParent);
    const std::string id = ToUtf8(node->m_strDevInstId);
    EXPECT_FALSE(picture.contains(id)) << id << " is in the tree twice";
    Seen& seen = picture[id];
    seen.port = PortText(hub.m_strPathName.substr(4), port.m_nPortIndex);
    VisitPreOrder(node, [&](const NodePtr& below) {
      if (below->m_nType != KUDTInterfaceDevice) return true;
      const auto& device = static_cast<const CZKUMInterfaceDeviceImpl&>(*below);
      if (device.VolumeName.empty()) return true;  // the disk of an empty slot
      const std::string text = VolumeText(device.VolumeName, device.MountPoints);
      EXPECT_TRUE(seen.volumes.insert(text).second) << text << " is in the tree twice";
      return true;
    });
    return true;
  });
  return picture;
}

class Watcher {
 public:
  explicit Watcher(std::uint32_t seed) : m_pc(seed), m_builder(m_pc.Pc()) {}
  RandomPc& Pc() { return m_pc; }
  std::size_t Publications() const { return m_publications; }
  const Ids& Ever() const { return m_ever; }
  void Build() {
    NoteEmptiedSlots();
    if (m_builder.Build()) {
      ++m_publications;
      CheckLists();
      CheckTree();
    }
    m_builder.CommitDeviceCache();
  }
  // With nothing going on, every device is connected that has a way to be.
  void CheckAtRest() {
    for (int i = 0; i < kBuildsUntilHeldAreBack; ++i) Build();
    for (const RandomGadget& gadget : m_pc.Gadgets()) {
      if (gadget.plugged && IsReported(gadget) && !CannotReturn(gadget)) {
        EXPECT_TRUE(m_connected.contains(ToUtf8(gadget.id))) << ToUtf8(gadget.id);
      }
    }
  }

 private:
  // Exception: a device whose own node is left out by its service has no info device. It is in the
  // tree and never in a list of arrivals; hubs are in no list at all.
  static bool IsReported(const RandomGadget& gadget) {
    return gadget.kind != RandomKind::Unreported && gadget.kind != RandomKind::Hub;
  }
  // Exception: a card that is taken out takes its slot and the reader along, which are reported as
  // removed and held back until they have a child again.
  bool MayBeHeld(const RandomGadget& gadget) const {
    return gadget.kind == RandomKind::CardReader && m_lostACard.contains(ToUtf8(gadget.id));
  }
  // Exception: a reader all of whose slots were emptied has no child that could bring it back.
  bool CannotReturn(const RandomGadget& gadget) const {
    if (!MayBeHeld(gadget)) return false;
    for (std::size_t slot = 0; slot < gadget.disks.size(); ++slot) {
      if (!gadget.disks[slot].empty() || !m_emptied.contains(DiskId(gadget, slot))) return false;
    }
    return true;
  }
  void NoteEmptiedSlots() {
    for (const RandomGadget& gadget : m_pc.Gadgets()) {
      if (!gadget.plugged || gadget.kind != RandomKind::CardReader) continue;
      for (std::size_t slot = 0; slot < gadget.disks.size(); ++slot) {
        const auto id = DiskId(gadget, slot);
        std::u16string card = gadget.disks[slot].empty() ? u"" : gadget.disks[slot][0];
        std::u16string& before = m_cards[id];
        if (!before.empty() && before != card) {
          m_lostACard.insert(ToUtf8(gadget.id));
          m_emptied.insert(id);
        }
        if (!card.empty()) m_emptied.erase(id);
        before = std::move(card);
      }
    }
  }
  Ids ListOf(DeviceListKind kind) const {
    Ids ids;
    for (const NodePtr& node : *m_builder.GetDeviceList(kind)) ids.insert(ToUtf8(node->m_strDevInstId));
    return ids;
  }
  // What was connected, with those that came and without those that left, is connected now; and
  // nothing comes that was connected, or leaves the tree unreported.
  void CheckLists() {
    const Ids before = std::exchange(m_connected, ListOf(kConnectedList));
    const Ids attached = ListOf(kAttachedList), removed = ListOf(kRemovedList);
    Ids expected = before;
    for (const std::string& id : attached) EXPECT_TRUE(expected.insert(id).second) << id;
    for (const std::string& id : removed) expected.erase(id);
    EXPECT_EQ(m_connected, expected);
    m_ever.insert(m_connected.begin(), m_connected.end());
    Picture shown = PictureOfTree(m_builder.Root());
    for (const auto& [id, seen] : m_shown) EXPECT_TRUE(shown.contains(id) || removed.contains(id));
    m_shown = std::move(shown);
  }
  // Exception: a held reader may return and be held again in one build. It is reported as both, in
  // this order, and shows what it had when it was held the first time.
  bool CameAndLeft(const std::string& id) const {
    return ListOf(kAttachedList).contains(id) && ListOf(kRemovedList).contains(id);
  }
  void CheckTree() {
    Picture shown = m_shown;
    Picture expected = PictureOfPc(m_pc.Pc().Snapshot(), m_pc);
    Ids reported;
    for (const RandomGadget& gadget : m_pc.Gadgets()) {
      const std::string id = ToUtf8(gadget.id);
      if (!expected.contains(id)) continue;
      const bool held = MayBeHeld(gadget) && !m_connected.contains(id);
      // Exception: without its info device nothing is merged into a port device, no volume either.
      if (held) expected[id].volumes.clear();
      if (held && CameAndLeft(id)) shown[id].volumes.clear();
      if (IsReported(gadget) && !held) reported.insert(id);
    }
    EXPECT_EQ(shown, expected);
    EXPECT_EQ(m_connected, reported);
    std::erase_if(m_lostACard, [this](const std::string& id) { return m_connected.contains(id); });
  }
  RandomPc m_pc;
  CZKUMUsbTreeBuilder m_builder;
  Picture m_shown;  // by the last publication
  Ids m_connected, m_ever, m_lostACard;
  std::set<std::u16string> m_emptied;
  std::map<std::u16string, std::u16string> m_cards;  // by slot, as the last build met them
  std::size_t m_publications = 0;
};

TEST(RandomScripts, PublishWhatIsThereAndReportWhatChanged) {
  const std::uint32_t firstSeed = FirstSeed(), scripts = testing_support::Cases(500u, 25u);
  std::cout << "ZKUSB_RANDOM_SEED=" << firstSeed << '\n';
  std::size_t publications = 0, devices = 0;
  for (std::uint32_t seed = firstSeed; seed < firstSeed + scripts; ++seed) {
    Watcher watcher(seed);
    for (int i = 0; i < kChangesPerScript; ++i) {
      watcher.Pc().Change();
      // Most changes are met by a build of their own, some by one for several.
      if (watcher.Pc().Below(4) != 0) watcher.Build();
    }
    watcher.CheckAtRest();
    publications += watcher.Publications();
    devices += watcher.Ever().size();
    ASSERT_FALSE(HasFailure()) << "seed " << seed << ":" << watcher.Pc().Script();
  }
  std::cout << publications << " publications, " << devices << " devices\n";
  EXPECT_GE(publications, scripts * 12 / 5);
  EXPECT_GE(devices, scripts * 2);
}

}  // namespace
}  // namespace KelvoUHW
