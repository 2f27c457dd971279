#include "devinfo/info_device.h"

#include <gtest/gtest.h>

#include <tuple>

#include "devinfo/devnode.h"

namespace KelvoUHW {
namespace {

// Every field set.
void Fill(CZKUMInfoDeviceImpl& device) {
  device.SetInstanceId(u"USBSTOR\\DISK&VEN_V&PROD_P\\S");
  device.m_strDeviceDescr = u"descr";
  device.m_strDriverKeyName = u"driver";
  device.m_strDevInstIdParent = u"parent";
  device.m_devInstHandle = 21;
  device.m_devInstHandleParent = 22;
  device.DevClass = u"Class";
  device.ClassGuidText = u"guid text";
  device.ClassGuid = {0x4D36E967, 0xE325, 0x11CE, {0xBF, 0xC1, 8, 0, 0x2B, 0xE1, 3, 0x18}};
  device.Location = u"location";
  device.FriendlyName = u"friendly";
  device.Manufacturer = u"mfg";
  device.HardwareId = u"hardware";
  device.PhysicalName = u"physical";
  device.Service = u"service";
  device.LegacyBusType = 4;
  device.EnumName = u"enum";
  device.UiNumber = 0x1F;
}

std::u16string Dump(const CZKUMInfoDeviceImpl& device) {
  std::u16string out;
  device.ToString(out, u"> ");
  return out;
}

constexpr char16_t kEmptyDump[] =
    u">  Info ------------------------------------------\r\n"
    u"> devInstHandle        : -1\r\n"
    u"> devInstHandleParent  : -1\r\n"
    u"> INTERFACE_TYPE: InterfaceTypeUndefined\r\n"
    u"childvector size0\r\n"
    u"ChildsToString End\r\n";

TEST(InfoDevice, DumpsEveryField) {
  CZKUMInfoDeviceImpl device;
  Fill(device);
  AddChild(NodePtr(new CZKUMInfoDeviceImpl), &device);
  // The class name decides about the first class line and is not in it: this is meant.
  EXPECT_EQ(Dump(device),
            u">  Info ------------------------------------------\r\n"
            u"> DevInstId            : USBSTOR\\DISK&VEN_V&PROD_P\\S\r\n"
            u"> driverKeyName : driver\r\n"
            u"> m_strDevInstIdParent : parent\r\n"
            u"> deviceDescr : descr\r\n"
            u"> serial number        : S\r\n"
            u"> Vendor; product: V;P\r\n"
            u"> devInstHandle        : 21\r\n"
            u"> devInstHandleParent  : 22\r\n"
            u"> SPDRP_CLASS: guid text\r\n"
            u"> SPDRP_CLASS: {4D36E967-E325-11CE-BFC1-08002BE10318}\r\n"
            u"> SPDRP_FRIENDLYNAME: friendly\r\n"
            u"> SPDRP_MFG: mfg\r\n"
            u"> INTERFACE_TYPE: TurboChannel\r\n"
            u"> SPDRP_HARDWAREID: hardware\r\n"
            u"> SPDRP_PHYSICAL_DEVICE_OBJECT_NAME: physical\r\n"
            u"> SPDRP_SERVICE: service\r\n"
            u"> SPDRP_ENUMERATOR_NAME: enum\r\n"
            u"> SPDRP_LOCATION_INFORMATION: location\r\n"
            u"> SPDRP_UI_NUMBER    : 0x1F\r\n"
            u"childvector size0\r\n"
            u"child 0\r\n"
            u"> -  Info ------------------------------------------\r\n"
            u"> - devInstHandle        : -1\r\n"
            u"> - devInstHandleParent  : -1\r\n"
            u"> - INTERFACE_TYPE: InterfaceTypeUndefined\r\n"
            u"childvector size0\r\n"
            u"ChildsToString End\r\n"
            u"ChildsToString End\r\n");
}

TEST(InfoDevice, ClassLinesFollowTheNameAndTheGuid) {
  const std::tuple<const char16_t*, platform::Guid, std::u16string> cases[] = {
      {u"", {}, u""},
      {u"Class", {}, u"> SPDRP_CLASS: text\r\n"},
      {u"", {1, 0, 0, {}}, u"> SPDRP_CLASS: {00000001-0000-0000-0000-000000000000}\r\n"}};
  for (const auto& [name, guid, lines] : cases) {
    CZKUMInfoDeviceImpl device;
    device.DevClass = name;
    device.ClassGuidText = u"text";
    device.ClassGuid = guid;
    std::u16string expected = kEmptyDump;
    expected.insert(expected.find(u"> INTERFACE"), lines);
    EXPECT_EQ(Dump(device), expected);
  }
}

TEST(InfoDevice, BusTypesReachOneTooFar) {
  // The name of 17 is meant.
  const std::pair<std::int32_t, std::u16string> cases[] = {
      {-2, u""},       {-1, u"InterfaceTypeUndefined"}, {0, u"Internal"}, {5, u"PCIBus"},
      {15, u"PNPBus"}, {16, u"MaximumInterfaceType"},   {17, u"usbhub"},  {18, u""}};
  for (const auto& [value, name] : cases) {
    CZKUMInfoDeviceImpl device;
    device.LegacyBusType = value;
    const std::u16string dump = Dump(device);
    const std::size_t line = dump.find(u"> INTERFACE_TYPE: " + name + u"\r\n");
    EXPECT_EQ(line != dump.npos, !name.empty()) << value;
    EXPECT_EQ(dump.find(u"INTERFACE_TYPE") != dump.npos, !name.empty()) << value;
  }
}

TEST(InfoDevice, ResetLeavesThreeFields) {
  CZKUMInfoDeviceImpl device;
  Fill(device);
  device.Reset();
  EXPECT_EQ(device.m_strSerialNumber, u"S");
  EXPECT_EQ(device.Location, u"location");
  EXPECT_EQ(device.EnumName, u"enum");
  device.m_strSerialNumber = device.Location = device.EnumName = u"";
  EXPECT_EQ(Dump(device), kEmptyDump);

  device.SetInstanceId(u"USB\\VID_1&PID_2\\3");
  device.Reset();
  EXPECT_EQ(device.m_nVendorId, kUnknownId);
  EXPECT_EQ(device.m_nProductId, kUnknownId);
}

}  // namespace
}  // namespace KelvoUHW
