#include <gtest/gtest.h>

#include <array>

#include "platform/simulated/simulated_pc.h"
#include "tests/platform/stick_pc.h"

namespace platform::simulated {
namespace {

class DeviceManagerTest : public testing::Test {
 protected:
  static Machine ParentlessMachine() {
    Machine machine = StickMachine();
    machine.devices[5].noParent = true;
    return machine;
  }

  // Parent, child and sibling, 0 for none with the error; the out value must be left alone then.
  std::array<DevInst, 3> Around(DevInst node, std::uint32_t errorOfNone = kCR_NO_SUCH_DEVNODE) {
    std::array<DevInst, 3> around{0xABCD, 0xABCD, 0xABCD};
    const Status found[] = {pc.GetParent(node, around[0]), pc.GetChild(node, around[1]),
                            pc.GetSibling(node, around[2])};
    for (std::size_t i = 0; i < 3; ++i) {
      if (found[i]) continue;
      EXPECT_EQ(found[i].error, errorOfNone) << node;
      EXPECT_EQ(around[i], DevInst{0xABCD}) << node;
      around[i] = 0;
    }
    return around;
  }

  SimulatedPc pc{ParentlessMachine()};
};

TEST_F(DeviceManagerTest, TheTreeBeforeAndAfterChanges) {
  DevInst root = 0;
  ASSERT_TRUE(pc.LocateRootDevNode(root));
  EXPECT_EQ(root, kRootDeviceNumber);
  const struct {
    DevInst node;
    std::array<DevInst, 3> around;
  } kNodes[] = {{root, {0, 1, 0}}, {1, {root, 2, 6}}, {2, {1, 3, 0}}, {3, {2, 0, 4}},
                {4, {2, 5, 0}},    {5, {4, 0, 0}},    {6, {0, 7, 0}},  // the device manager finds no parent for it
                {7, {6, 0, 8}},    {8, {6, 0, 0}}};
  for (const auto& [node, around] : kNodes) EXPECT_EQ(Around(node), around) << node;

  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  for (const DevInst node : {DevInst{0}, DevInst{4}, DevInst{9}, DevInst{0xFFFFFFFF}}) {
    EXPECT_EQ(Around(node, kCR_INVALID_DEVNODE), (std::array<DevInst, 3>{}));
    char16_t text[200];
    std::uint32_t bytes = 400;
    EXPECT_EQ(Error(pc.GetDeviceId(node, text, 200)), kCR_INVALID_DEVNODE);
    EXPECT_EQ(Error(pc.GetDevNodeRegistryProperty(node, kCM_DRP_DRIVER, nullptr, text, bytes)), kCR_INVALID_DEVNODE);
  }

  Plug newcomers;
  newcomers.fragment.devices = {MakeDevice(u"USB\\NEW\\1", kHub, u"USB", u"{usb}\\0009"),
                                MakeDevice(u"usb\\vid_0781&pid_5580\\aa01", kHub, u"USB", u"k")};
  ASSERT_EQ(pc.Apply({0, u"", newcomers}), u"");
  EXPECT_EQ(Around(3)[1], 9u) << "a new id takes the next number";
  EXPECT_EQ(Around(9)[2], 4u) << "one that comes back keeps its own, in either case";
}

TEST_F(DeviceManagerTest, IdsAndProperties) {
  char16_t text[200] = {};
  ASSERT_TRUE(pc.GetDeviceId(kRootDeviceNumber, text, 200));
  EXPECT_EQ(Text(text), kRootDeviceId);
  const Text stick = kStick;
  for (std::uint32_t size = 0; size <= stick.size() + 1; ++size) {
    Text buffer(size, u'?');
    EXPECT_EQ(Error(pc.GetDeviceId(4, buffer.data(), size)), size > stick.size() ? 0 : kCR_BUFFER_SMALL) << size;
    EXPECT_EQ(UpToZero(buffer), size > stick.size() ? stick : Text(size, u'?'));
  }
  for (const std::uint32_t size : {0u, 21u, 22u}) {
    std::uint32_t bytes = size;
    std::uint32_t type = 0;
    const Status status = pc.GetDevNodeRegistryProperty(4, kCM_DRP_DRIVER, &type, size == 0 ? nullptr : text, bytes);
    EXPECT_EQ(Error(status), size < 22 ? kCR_BUFFER_SMALL : 0);
    EXPECT_EQ(type, kREG_SZ);
    EXPECT_EQ(bytes, 22u);
  }
  EXPECT_EQ(Text(text), u"{usb}\\0003");
  std::uint32_t bytes = 400;
  for (const DevInst node : {kRootDeviceNumber, DevInst{4}}) {
    for (const std::uint32_t property : {kCM_DRP_DEVICEDESC, decltype(kCM_DRP_DEVICEDESC){0}}) {
      EXPECT_EQ(Error(pc.GetDevNodeRegistryProperty(node, property, nullptr, text, bytes)), kCR_NO_SUCH_VALUE);
      EXPECT_EQ(bytes, 400u);
    }
  }
}

}  // namespace
}  // namespace platform::simulated
