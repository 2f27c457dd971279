// Whole builds against a host that lies: they end, give back what they opened, and what they
// publish can be dumped and climbed. The input is what fuzz/lying_host.h makes of it.
#include <vector>

#include "bench/plugs.h"
#include "fuzz/lying_host.h"
#include "simulation/pc/simulated_pc.h"
#include "tree/publication.h"
#include "tree/tree_builder.h"

namespace {

using namespace KelvoUHW;
using fuzz::Require;
using platform::simulated::SimulatedPc;

constexpr std::size_t kBuilds = 3;

void Plug(SimulatedPc& pc, const Change& change) { pc.Apply({0, u"", change}); }

// Refused where the device is there already, or not: the PC stays as it is.
void ChangePc(SimulatedPc& pc, std::uint8_t how) {
  switch (how % 8) {
    case 0:
      return Plug(pc, Stick(u"S2", 4, u'G'));
    case 1:
      return Plug(pc, Unplug{UsbId(u"S2")});
    case 2:
      return Plug(pc, Unplug{UsbId(u"K1")});
    case 3:
      return Plug(pc, Gadget(u"K1", 1, UsbId(u"HUB")));
    case 4:
      return Plug(pc, Volume(DiskId(u"CR"), u'F'));
    case 5:
      return Plug(pc, Unplug{VolumeId(DiskId(u"CR"))});
    case 6:
      return Plug(pc, Unplug{UsbId(u"HUB")});
    default:
      return Plug(pc, ExternalHub(u"HUB", 1, kNewHubService));
  }
}

const Machine& FullPc() {
  static const Machine machine = [] {
    SimulatedPc pc(BarePc(kNewHubService));
    for (const Change& change :
         {Change(InternalDisk()), Change(ExternalHub(u"HUB", 1, kNewHubService)),
          Change(Gadget(u"K1", 1, UsbId(u"HUB"))), Change(Stick(u"S1", 2, u'E', UsbId(u"HUB"))),
          Change(CardReader(u"CR", 2))}) {
      Plug(pc, change);
    }
    return pc.Snapshot();
  }();
  return machine;
}

void Check(const CZKUMUsbTreeBuilder& builder) {
  for (std::size_t kind = kConnectedList; kind <= kModifiedList; ++kind) {
    for (const NodePtr& node : *builder.GetDeviceList(kind)) {
      Require(node && node->m_nType == KUDTPortDevice, "port devices in lists");
      ReachesRoot(*node);
    }
  }
  if (!builder.Root()) return;
  std::u16string dump;
  builder.Root()->ToString(dump, u"");
  Require(dump.ends_with(u"ChildsToString End\r\n"), "whole dump");
  VisitPreOrder(builder.Root(), [](const NodePtr& node) {
    Require(node.RingSize() >= 1, "held by the tree");
    HubPortClimbs().From(node.Get());
    return true;
  });
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::Input input(data, size);
  SimulatedPc pc(FullPc());
  fuzz::LyingHost host(pc, input, [&pc](std::uint8_t how) { ChangePc(pc, how); });
  const std::size_t live = ConnectionRecord::LiveCount() - ConnectionRecord::KeptCount();
  {
    CZKUMUsbTreeBuilder builder(host);
    for (std::size_t build = 1; build <= kBuilds; ++build) {
      builder.Build();
      Check(builder);
      builder.CommitDeviceCache();
      const auto open = pc.Open();
      Require(open.files == 0 && open.searches == 0 && open.imageLists == 0, "closed");
      // Two sets of each build stay open by design, one of the first storage cache, and one where a
      // device is said to have no parent.
      Require(open.sets <= 1 + 3 * build, "sets given back");
    }
  }
  Require(pc.Misuses().empty(), "closed once");
  Require(ConnectionRecord::LiveCount() - ConnectionRecord::KeptCount() == live, "records freed");
  return 0;
}
