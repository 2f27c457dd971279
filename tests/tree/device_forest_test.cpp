#include "tree/device_forest.h"

#include <gtest/gtest.h>

#include <sstream>

#include "bench/small_pcs.h"
#include "platform/wrappers/failing_host.h"
#include "simulation/pc/simulated_pc.h"
#include "tests/support/best_time.h"
#include "tests/support/cases.h"
#include "tests/support/outline.h"

namespace KelvoUHW {
namespace {

using platform::simulated::Device, platform::simulated::OpenCounts, platform::simulated::SimulatedPc;
using platform::wrappers::FailingHost, platform::wrappers::Operation;
using Records = std::vector<DeviceNodeRecord>;

// The changes of a case go to the second device.
Machine ThreeDevices() {
  Machine machine;
  machine.devices = {DeviceNode(u"ACPI\\A", u"", u"System", u"{k}\\1", u"first"),
                     DeviceNode(u"PCI\\B", u"ACPI\\A", u"Display", u"{k}\\2", u"second"),
                     DeviceNode(u"PCI\\C", u"ACPI\\A", u"System", u"{k}\\3", u"third")};
  machine.devices[1].classGuid = u"{4d36e968-e325-11ce-bfc1-08002be10318}";
  return machine;
}

Records ReadAll(platform::Host& host) {
  DeviceAnswers answers(host);
  DeviceRecordReader reader(host, answers);
  Records records;
  for (const PresentDevice& device : reader.Read()) reader.Complete(records.emplace_back(RecordOf(device)));
  return records;
}

TEST(DeviceRecords, WhichDevicesAreRead) {
  struct Case {
    const char* what;
    void (*change)(Device&);
    std::string names;
    std::size_t setsLeftOpen = 0;
    std::optional<Operation> fails{};
  };
  const Case cases[] = {
      {"all", [](Device&) {}, "first second third "},
      {"no class", [](Device& d) { d.deviceClass.reset(); }, "first third "},
      {"no class image", [](Device& d) { d.noClassImage = true; }, "first third "},
      {"no class description", [](Device& d) { d.noClassDescription = true; }, "first third "},
      {"a processor", [](Device& d) { d.deviceClass = u"pROCESSOR"; }, "first third "},
      {"a computer", [](Device& d) { d.deviceClass = u"COMPUTER"; }, "first third "},
      {"a class that begins alike", [](Device& d) { d.deviceClass = u"Computers"; }, "first second third "},
      {"a friendly name of 126 bytes with its zero", [](Device& d) { d.friendlyName = Text(62, u'f'); },
       "first " + std::string(62, 'f') + " third "},
      {"a friendly name that is too long", [](Device& d) { d.friendlyName = Text(63, u'f'); }, "first second third "},
      {"both names too long", [](Device& d) { d.friendlyName = d.description = Text(63, u'f'); }, "first  third "},
      {"a class name that is too long", [](Device& d) { d.deviceClass = Text(260, u'c'); }, "first third "},
      {"no parent", [](Device& d) { d.noParent = true; }, "", 1},
      {"a processor without parent", [](Device& d) { d.noParent = true, d.deviceClass = u"Processor"; }, "", 1},
      {"no class and no parent, asked last", [](Device& d) { d.noParent = true, d.deviceClass.reset(); },
       "first third "},
      {"no set", [](Device&) {}, "", 0, Operation::GetClassDevs},
      {"no image list", [](Device&) {}, "", 0, Operation::GetClassImageList},
      {"no image for any", [](Device&) {}, "", 0, Operation::GetClassImageIndex}};
  for (const Case& c : cases) {
    Machine machine = ThreeDevices();
    c.change(machine.devices[1]);
    SimulatedPc pc(machine);
    const std::uint64_t call = c.fails ? 1 : platform::wrappers::FailurePlan::kNever;
    const Operation counted = c.fails.value_or(Operation::EnumDeviceInfo);
    FailingHost host(pc, {.call = call, .onwards = true, .operation = counted});
    std::string names;
    for (const DeviceNodeRecord& record : ReadAll(host)) names += platform::ToUtf8(record.Name) + " ";
    EXPECT_EQ(names, c.names) << c.what;
    EXPECT_EQ(host.Failures() != 0, c.fails.has_value()) << c.what;
    EXPECT_LE(host.Calls(), machine.devices.size() + 1) << c.what;
    EXPECT_TRUE(pc.Open() == OpenCounts{.sets = c.setsLeftOpen} && pc.Misuses().empty()) << c.what;
  }
}

// As one whose description cannot be read.
TEST(DeviceRecords, AClassWhoseDescriptionHasNoEndIsNotShown) {
  struct Endless final : platform::wrappers::InterceptingHost {
    using InterceptingHost::InterceptingHost;
    platform::Status BeforeCall(const platform::wrappers::HostCall&) noexcept override { return {}; }
    platform::Status GetClassDescription(const platform::Guid&, char16_t* text, std::uint32_t chars,
                                         std::uint32_t*) noexcept override {
      std::fill_n(text, chars, u'x');
      if (ended) text[chars - 1] = u'\0';
      return platform::Status::Success();
    }
    bool ended = false;
  };
  SimulatedPc pc(ThreeDevices());
  Endless host(pc);
  for (const bool ended : {false, true}) {
    host.ended = ended;
    EXPECT_EQ(ReadAll(host).size(), ended ? 3u : 0u);
  }
}

TEST(DeviceRecords, FieldsAreThoseOfTheDevice) {
  Machine machine = ThreeDevices();
  machine.devices[1].location = u"slot 3";
  machine.devices[1].hardwareIds = {{u"PCI\\FIRST", u"PCI\\SECOND"}};
  SimulatedPc pc(machine);
  const Records records = ReadAll(pc);
  ASSERT_EQ(records.size(), 3u);
  EXPECT_EQ(records[0].ParentDevInst, platform::simulated::kRootDeviceNumber);
  EXPECT_EQ(records[0].ParentInstanceId + records[0].Location, platform::simulated::kRootDeviceId);
  const DeviceNodeRecord& record = records[1];
  EXPECT_EQ(record.DevInst * 100 + record.ParentDevInst, 201u);
  EXPECT_EQ(record.InstanceId + u" < " + record.ParentInstanceId + u", " + record.ClassName + u": " +
                record.ClassDescription + u", " + record.Location + u", " + record.HardwareId,
            u"PCI\\B < ACPI\\A, Display: Display adapters, slot 3, PCI\\FIRST");
}

// Devices from words such as "d*b": name, class, parent ("-" for one that is nowhere).
std::vector<PresentDevice> FromText(const std::string& text) {
  std::vector<PresentDevice> devices;
  std::istringstream words(text);
  for (std::string word; words >> word;) {
    PresentDevice& device = devices.emplace_back();
    device.DevInst = static_cast<platform::DevInst>(word.front());
    device.ParentDevInst = static_cast<platform::DevInst>(word.back());
    device.ClassName = u"System";
    if (word[1] == '*') device.ClassName = u"DiskDrive";
    if (word[1] == '+') device.ClassName = u"diskDRIVE";
    if (word[1] == '!') device.ClassName = u"USB";
    if (word[1] == '~') device.ClassName = u"usB";
  }
  return devices;
}

// "a(b(d) e)".
std::string ToText(const Records& level) {
  std::string text;
  for (const DeviceNodeRecord& record : level) {
    text += text.empty() ? "" : " ";
    text += static_cast<char>(record.DevInst);
    if (!record.Children.empty()) text += "(" + ToText(record.Children) + ")";
  }
  return text;
}

TEST(DeviceForest, ChainsThatEndInDiskDrives) {
  const char* const cases[][3] = {{"parents read first", "a- ba d*b", "a(b(d))"},
                                  {"children read first", "d*b ba a-", "a(b(d))"},
                                  {"branches without disk", "a- ba ca d*c e*a fa", "a(c(d) e)"},
                                  {"what lies below a disk", "d*- ed", "d"},
                                  {"a disk below a disk", "d*- ed fe g*f hf", "d(e(f(g)))"},
                                  {"a USB record goes with its subtree", "a- b!a d*b e*a", "a(e)"},
                                  {"at any depth, and its parent stays", "a- ba c!b d*c", "a(b)"},
                                  {"one that is a parent of disks at the top stays", "a!- d*a", "a(d)"},
                                  {"one that is at the top for want of a parent stays", "b!a d*b", "b(d)"},
                                  {"class names in other case", "a- b~a d+b e+a", "a(e)"},
                                  {"the top level as read", "x*- a*- m- n*m", "x a m(n)"},
                                  {"children that waited, then those read later", "d*p e*p p- f*p", "p(d e f)"},
                                  {"its own parent", "aa d*a", "a(d)"},
                                  {"a circle of three", "ac ba cb d*b", "c(a(b(d)))"},
                                  {"a circle without disk", "ab ba d*x", "d"}};
  for (const auto& [what, records, forest] : cases) {
    EXPECT_EQ(ToText(LinkDeviceForest(FromText(records))), forest) << what;
  }
}

DeviceNodeRecord Record(std::u16string id, Records children = {}) {
  DeviceNodeRecord record;
  record.DevInst = 77;
  record.InstanceId = id;
  record.ParentInstanceId = u"of " + id;
  record.Name = u"name of " + id;
  record.ClassName = u"class of " + id;
  record.Children = std::move(children);
  return record;
}

std::string NodesOf(const Records& forest, const NodePtr& root) {
  AddForestNodes(forest, *root);
  std::string text;
  for (const NodePtr& child : root->m_childs) text += OutlineOf(child);
  return text;
}

TEST(ForestNodes, PciDevicesWithTwoLevelsBelow) {
  const std::tuple<const char*, Records, const char*> cases[] = {
      {"no PCI device", {Record(u"ACPI\\A", {Record(u"pci\\B", {Record(u"IDE\\D")})})}, ""},
      {"below something else, by the text anywhere in its id, and after one at the top",
       {Record(u"PCI\\T"), Record(u"ACPI\\A", {Record(u"ACPI\\B", {Record(u"XPCI\\C")})})},
       "controller PCI\\T < of PCI\\T\ncontroller XPCI\\C < of XPCI\\C\n"},
      {"two levels and no more, and a PCI device below another is no controller",
       {Record(u"PCI\\C", {Record(u"PCI\\H", {Record(u"IDE\\D", {Record(u"PCI\\DEEP")})}), Record(u"IDE\\E")})},
       "controller PCI\\C < of PCI\\C\n.hub PCI\\H '' < of PCI\\H\n"
       "..port 0 status 0 IDE\\D port 0 < of IDE\\D\n...device IDE\\D 'name of IDE\\D' class of IDE\\D speed 0\n"
       ".hub IDE\\E '' < of IDE\\E\n"},
      {"the same node twice: what hangs below the second is lost",
       {Record(u"PCI\\C", {Record(u"H", {Record(u"D"), Record(u"D"), Record(u"E")}), Record(u"H", {Record(u"F")})}),
        Record(u"PCI\\C", {Record(u"G")})},
       "controller PCI\\C < of PCI\\C\n.hub H '' < of H\n"
       "..port 0 status 0 D port 0 < of D\n...device D 'name of D' class of D speed 0\n"
       "..port 0 status 0 E port 0 < of E\n...device E 'name of E' class of E speed 0\n"}};
  for (const auto& [what, forest, nodes] : cases) {
    EXPECT_EQ(NodesOf(forest, MakeRecord<CZKUMUsbTreeRootImpl>()), nodes) << what;
  }
  // A controller of the USB walk has a description, so both are in the tree, that one first.
  const NodePtr root = MakeRecord<CZKUMUsbTreeRootImpl>();
  const auto walked = MakeRecord<CZKUMHostControllerImpl>();
  walked->SetInstanceId(u"PCI\\C");
  walked->m_strDeviceDescr = u"described";
  AddChild(walked, root.Get());
  EXPECT_EQ(NodesOf({Record(u"PCI\\C")}, root), "controller PCI\\C\ncontroller PCI\\C < of PCI\\C\n");
  EXPECT_EQ(FindByInstanceId(root, u"PCI\\C"), walked);
}

TEST(ForestNodes, DiskDriveRecordsAreCopiedAsFoundFirst) {
  const Records forest = LinkDeviceForest(FromText("a- d*a ed f*e ba g+b h*-"));
  EXPECT_EQ(ToText(forest), "a(d(e(f)) b(g)) h");
  EXPECT_EQ(ToText(DiskDriveRecords(forest)), "d(e(f)) g h");
  EXPECT_EQ(ToText(forest), "a(d(e(f)) b(g)) h");
}

// Each device below the one before, or all side by side.
std::vector<PresentDevice> ChainOf(platform::DevInst length, bool parentsFirst, bool disksOnly, bool below = true) {
  std::vector<PresentDevice> devices(length);
  for (platform::DevInst i = 0; i < length; ++i) {
    PresentDevice& device = devices[parentsFirst ? i : length - 1 - i];
    device.DevInst = i + 1;
    device.ParentDevInst = below ? i : 0;
    device.ClassName = disksOnly || i + 1 == length ? u"DiskDrive" : u"System";
  }
  return devices;
}

// A recursion anywhere would end in a stack overflow.
TEST(DeviceForest, ChainsAreLoopsHoweverLong) {
  const platform::DevInst length = testing_support::Cases(200'000u, 100'000u);
  for (const bool disksOnly : {true, false}) {
    Records forest = LinkDeviceForest(ChainOf(length, !disksOnly, disksOnly));
    const auto root = MakeRecord<CZKUMUsbTreeRootImpl>();
    AddForestNodes(forest, *root);
    const Records disks = DiskDriveRecords(forest);
    forest = disks;
    std::size_t depth = 0;
    for (const Records* level = &forest; !level->empty(); level = &level->front().Children) ++depth;
    EXPECT_EQ(depth, disksOnly ? length : 1);
    EXPECT_EQ(root->m_childs.size() + disks.size(), 1u);
  }
}

// A climb at each device would take 35 times as long and more below each other as side by side.
TEST(DeviceForest, ChainsTakeTheirLengthAndNotItsSquare) {
  for (const bool parentsFirst : {true, false}) {
    if (!parentsFirst && !testing_support::EveryCase()) break;
    const auto time = [&](bool below) {
      return testing_support::BestOfThree(
          [&] { EXPECT_FALSE(LinkDeviceForest(ChainOf(40'000, parentsFirst, true, below)).empty()); });
    };
    EXPECT_LT(time(true), 15 * time(false)) << parentsFirst;
  }
}

}  // namespace
}  // namespace KelvoUHW
