#include <gtest/gtest.h>

#include <vector>

#include "platform/simulated/simulated_pc.h"
#include "tests/platform/stick_pc.h"

namespace platform::simulated {
namespace {

class DeviceManagerTest : public testing::Test {
 protected:
  using Move = Status (SimulatedPc::*)(DevInst, DevInst&) noexcept;
  static constexpr DevInst kMark = 0xABCD;

  // Where a move leads, or 0 with the error in `m_error`; the out value must be left alone then.
  DevInst Go(Move move, DevInst from) {
    DevInst to = kMark;
    const Status status = (pc.*move)(from, to);
    m_error = status.ok ? 0 : status.error;
    if (status) return to;
    EXPECT_EQ(to, kMark);
    return 0;
  }

  static Machine ParentlessMachine() {
    Machine machine = StickMachine();
    machine.devices[5].noParent = true;
    return machine;
  }

  SimulatedPc pc{ParentlessMachine()};
  std::uint32_t m_error = 0;
};

TEST_F(DeviceManagerTest, TheTree) {
  DevInst root = 0;
  ASSERT_TRUE(pc.LocateRootDevNode(root));
  EXPECT_EQ(root, kRootDeviceNumber);
  const struct {
    DevInst node, parent, child, sibling;
  } kNodes[] = {
      {root, 0, 1, 0}, {1, root, 2, 6}, {2, 1, 3, 0}, {3, 2, 0, 4},
      {4, 2, 5, 0},    {5, 4, 0, 0},    {6, 0, 7, 0},  // the device manager finds no parent for it
      {7, 6, 0, 8},    {8, 6, 0, 0},
  };
  for (const auto& [node, parent, child, sibling] : kNodes) {
    EXPECT_EQ(Go(&SimulatedPc::GetParent, node), parent) << node;
    if (parent == 0) {
      EXPECT_EQ(m_error, kCR_NO_SUCH_DEVNODE) << node;
    }
    EXPECT_EQ(Go(&SimulatedPc::GetChild, node), child) << node;
    if (child == 0) {
      EXPECT_EQ(m_error, kCR_NO_SUCH_DEVNODE) << node;
    }
    EXPECT_EQ(Go(&SimulatedPc::GetSibling, node), sibling) << node;
    if (sibling == 0) {
      EXPECT_EQ(m_error, kCR_NO_SUCH_DEVNODE) << node;
    }
  }
}

TEST_F(DeviceManagerTest, IdsAndProperties) {
  char16_t id[200];
  ASSERT_TRUE(pc.GetDeviceId(kRootDeviceNumber, id, 200));
  EXPECT_EQ(Text(id), kRootDeviceId);
  const Text stick = kStick;
  for (std::uint32_t size = 0; size <= stick.size() + 1; ++size) {
    Text buffer(size, u'?');
    const Status status = pc.GetDeviceId(4, buffer.data(), size);
    EXPECT_EQ(status.ok, size > stick.size()) << size;
    if (!status) {
      EXPECT_EQ(status.error, kCR_BUFFER_SMALL);
    }
    if (!status) {
      EXPECT_EQ(buffer, Text(size, u'?')) << "left as it was";
    }
  }

  char16_t key[200] = {};
  std::uint32_t type = 0;
  std::uint32_t bytes = 0;
  EXPECT_EQ(pc.GetDevNodeRegistryProperty(4, kCM_DRP_DRIVER, &type, nullptr, bytes).error,
            kCR_BUFFER_SMALL);
  EXPECT_EQ(type, kREG_SZ);
  ASSERT_EQ(bytes, 22u);
  ASSERT_TRUE(pc.GetDevNodeRegistryProperty(4, kCM_DRP_DRIVER, nullptr, key, bytes));
  EXPECT_EQ(Text(key), u"{usb}\\0003");
  bytes = 21;
  EXPECT_EQ(pc.GetDevNodeRegistryProperty(4, kCM_DRP_DRIVER, nullptr, key, bytes).error,
            kCR_BUFFER_SMALL);
  for (const DevInst node : {kRootDeviceNumber, DevInst{4}}) {
    bytes = 400;
    EXPECT_EQ(pc.GetDevNodeRegistryProperty(node, kCM_DRP_DEVICEDESC, &type, key, bytes).error,
              kCR_NO_SUCH_VALUE);
    EXPECT_EQ(bytes, 400u);
  }
  EXPECT_EQ(pc.GetDevNodeRegistryProperty(4, 0, &type, key, bytes).error, kCR_NO_SUCH_VALUE);
}

TEST_F(DeviceManagerTest, NodesThatAreNotThere) {
  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  for (const DevInst node : {DevInst{0}, DevInst{4}, DevInst{9}, DevInst{0xFFFFFFFF}}) {
    for (const Move move :
         {&SimulatedPc::GetParent, &SimulatedPc::GetChild, &SimulatedPc::GetSibling}) {
      EXPECT_EQ(Go(move, node), 0u);
      EXPECT_EQ(m_error, kCR_INVALID_DEVNODE) << node;
    }
    char16_t text[200];
    std::uint32_t bytes = 400;
    EXPECT_EQ(pc.GetDeviceId(node, text, 200).error, kCR_INVALID_DEVNODE);
    EXPECT_EQ(pc.GetDevNodeRegistryProperty(node, kCM_DRP_DRIVER, nullptr, text, bytes).error,
              kCR_INVALID_DEVNODE);
  }
}

TEST_F(DeviceManagerTest, AnIdThatComesBackKeepsItsNumber) {
  ASSERT_EQ(pc.Apply(UnplugStep(kStick)), u"");
  Plug newcomers;
  newcomers.fragment.devices = {MakeDevice(u"USB\\NEW\\1", kHub, u"USB", u"{usb}\\0009"),
                                MakeDevice(u"usb\\vid_0781&pid_5580\\aa01", kHub, u"USB", u"k")};
  ASSERT_EQ(pc.Apply({0, u"", newcomers}), u"");
  EXPECT_EQ(Go(&SimulatedPc::GetChild, 3), 9u) << "a new id takes the next number";
  EXPECT_EQ(Go(&SimulatedPc::GetSibling, 9), 4u) << "in either case";
}

}  // namespace
}  // namespace platform::simulated
