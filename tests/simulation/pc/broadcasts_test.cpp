#include "simulation/pc/broadcasts.h"

#include <gmock/gmock.h>

#include <cstring>

#include "bench/small_pcs.h"
#include "simulation/desktop/play_on_desktop.h"
#include "simulation/machine/machine_file.h"
#include "simulation/machine/steps.h"
#include "tests/simulation/stick_pc.h"
#include "tests/support/launch.h"

namespace platform::simulated {
namespace {

using testing::ElementsAre, testing::IsEmpty;

// "+E:", "-E: medium", "+PATH {class's first number}", "*" for changed nodes; "?" where the record
// is not as long as it says.
std::string Shown(const DeviceBroadcast& broadcast) {
  if (broadcast.event == kDBT_DEVNODES_CHANGED) return broadcast.record.empty() ? "*" : "?";
  std::string text = broadcast.event == kDBT_DEVICEARRIVAL ? "+" : "-";
  DEV_BROADCAST_HDR header;
  std::memcpy(&header, broadcast.record.data(), sizeof header);
  if (header.dbch_size != broadcast.record.size()) return "?";
  if (header.dbch_devicetype == kDBT_DEVTYP_VOLUME) {
    DEV_BROADCAST_VOLUME volume;
    std::memcpy(&volume, broadcast.record.data(), sizeof volume);
    for (char letter = 'A'; letter <= 'Z'; ++letter) {
      if ((volume.dbcv_unitmask >> (letter - 'A') & 1) != 0) text.append(1, letter).append(":");
    }
    return text + (volume.dbcv_flags == kDBTF_MEDIA ? " medium" : "");
  }
  DEV_BROADCAST_DEVICEINTERFACE_W entry;
  std::memcpy(&entry, broadcast.record.data(), sizeof entry);
  std::u16string name((broadcast.record.size() - kInterfaceBroadcastNameOffset) / 2, u'\0');
  std::memcpy(name.data(), broadcast.record.data() + kInterfaceBroadcastNameOffset, name.size() * 2);
  EXPECT_EQ(name.back(), u'\0');
  name.pop_back();
  return text + ToUtf8(name) + " " + ToUtf8(HexLower(entry.dbcc_classguid.Data1));
}

std::vector<std::string> Shown(const Machine& before, const Machine& after) {
  std::vector<std::string> texts;
  for (const DeviceBroadcast& broadcast : BroadcastsOf(before, after)) texts.push_back(Shown(broadcast));
  return texts;
}

Machine After(Machine machine, const auto& change) {
  EXPECT_EQ(ToUtf8(CarryOut(machine, change)), "");
  return machine;
}

TEST(Broadcasts, TellTheDifferenceInTheSystemsOrder) {
  const Machine whole = StickMachine(), without = After(whole, Unplug{kStick});
  const std::string disk = ToUtf8(kDiskPath) + " 53f56307", volume = ToUtf8(kStickVolumePath) + " 53f5630d";
  EXPECT_THAT(Shown(whole, without), ElementsAre("-E:", "-" + volume, "-" + disk, "*"));
  EXPECT_THAT(Shown(without, whole), ElementsAre("+" + disk, "+" + volume, "+E:", "*"));
  Machine unordered = whole;
  unordered.devices[4].parent = kStickVolume;  // the disk below the volume, which stands behind it
  EXPECT_THAT(Shown(without, unordered), ElementsAre("+" + volume, "+" + disk, "+E:", "*"));
  unordered.devices[6].parent = kDisk;  // a circle has no first one, and ends all the same
  EXPECT_EQ(Shown(without, unordered).size(), 4u);
  EXPECT_THAT(Shown(whole, whole), IsEmpty());
  const Machine dismounted = After(whole, Dismount{kStickVolumeName, u"E:\\"});
  EXPECT_THAT(Shown(whole, dismounted), ElementsAre("-E: medium")) << "the letter belongs to the disk";
  EXPECT_THAT(Shown(whole, After(whole, Dismount{kStickVolumeName, u"C:\\Mount\\Stick\\"})), IsEmpty());
  EXPECT_THAT(Shown(whole, After(whole, Mount{kStickVolumeName, u"Q:\\"})), ElementsAre("+Q:"));
  // Another volume behind the same letter; a device without an interface; letters in either case.
  Machine swapped = whole;
  swapped.volumes[1].name = u"\\\\?\\Volume{other}\\";
  swapped.volumes[0].paths = {u"c:\\"};
  swapped.interfaces[1].path = ToUpper(swapped.interfaces[1].path);
  EXPECT_THAT(Shown(whole, swapped), ElementsAre("-E: medium", "+E: medium"));
  Machine more = whole;
  more.devices.push_back(testing_support::DeviceNode(u"USB\\VID_1&PID_2\\3", kHub, u"USB", u"{usb}\\0009", u""));
  EXPECT_THAT(Shown(whole, more), ElementsAre("*"));
  // A short path leaves the record as long as its fixed part.
  EXPECT_EQ(InterfaceBroadcast(kDBT_DEVICEARRIVAL, {}, u"").record.size(), 32u);
}

// A process whose window notes what it hears, and whether the stick was there at that moment.
struct Listener {
  explicit Listener(const Machine& machine) : pc(machine) {
    s_listener = this;
    testing_support::Launch(desktop, [this] {
      WindowHandle window = 0;
      EXPECT_TRUE(testing_support::RegisterWindowClass(desktop, Procedure));
      EXPECT_TRUE(testing_support::MakeWindow(desktop, window));
      testing_support::PumpMessages(desktop);
    });
    desktop.RunFor(0);
  }
  bool Sees() const { return pc.Snapshot().devices.size() == StickMachine().devices.size(); }
  static LResult ZKUSB_WINDOW_CALL Procedure(WindowHandle, std::uint32_t message, WParam event, LParam) {
    if (message != kWM_DEVICECHANGE) return 1;
    const std::string what = event == kDBT_DEVNODES_CHANGED ? "nodes" : "volume";
    s_listener->heard.push_back(what + (s_listener->Sees() ? ", stick there" : ", no stick"));
    return 0;
  }
  SimulatedPc pc;
  std::vector<std::string> heard;
  SimulatedDesktop desktop;
  static inline Listener* s_listener = nullptr;
};

TEST(Broadcasts, GoOutAfterOrBeforeTheChangeOrNotAtAll) {
  const std::pair<BroadcastTime, std::vector<std::string>> kCases[] = {
      {BroadcastTime::After, {"volume, stick there", "nodes, stick there"}},
      {BroadcastTime::Before, {"volume, no stick", "nodes, no stick"}},
      {BroadcastTime::None, {}}};
  for (const auto& [when, heard] : kCases) {
    Listener listener(After(StickMachine(), Unplug{kStick}));
    const Step step{0, u"", StickPlug(), when};
    EXPECT_EQ(ToUtf8(PlayStep(listener.pc, listener.desktop, step)), "");
    EXPECT_TRUE(listener.Sees());
    listener.desktop.Settle();
    // Refused by the PC: nothing changes and nobody is told.
    EXPECT_NE(PlayStep(listener.pc, listener.desktop, step), u"");
    EXPECT_EQ(listener.heard, heard);
  }
}

}  // namespace
}  // namespace platform::simulated
