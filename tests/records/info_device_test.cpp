#include "records/info_device.h"

#include <gtest/gtest.h>

#include <sstream>

#include "records/devnode.h"
#include "tests/support/outline.h"

namespace KelvoUHW {
namespace {

void FillEveryField(CZKUMInfoDeviceImpl& device) {
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

// Of a record with nothing in it but what these lines show.
std::string DumpWith(const std::string& classLine, const std::string& busType) {
  return ">  Info ------------------------------------------\r\n> devInstHandle        : -1\r\n"
         "> devInstHandleParent  : -1\r\n" +
         classLine + (busType.empty() ? "" : "> INTERFACE_TYPE: " + busType + "\r\n") +
         "childvector size0\r\nChildsToString End\r\n";
}

TEST(InfoDevice, DumpsEveryFieldAndResetLeavesThree) {
  CZKUMInfoDeviceImpl device;
  FillEveryField(device);
  // The class name decides about the first class line and is not in it: this is deliberate.
  EXPECT_EQ(DumpOf(device, u"> "), Golden("info-device"));
  device.m_nVendorId = device.m_nProductId = 1;
  device.Reset();
  EXPECT_TRUE(device.m_nVendorId == kUnknownId && device.m_nProductId == kUnknownId);
  EXPECT_EQ(device.m_strSerialNumber + device.Location + std::u16string(device.EnumName), u"Slocationenum");
  device.m_strSerialNumber = device.Location = u"";
  device.EnumName.clear();
  EXPECT_EQ(DumpOf(device, u"> "), DumpWith("", "InterfaceTypeUndefined"));
}

TEST(InfoDevice, ClassLinesAndBusTypes) {
  CZKUMInfoDeviceImpl named, withGuid, onBus;
  named.DevClass = u"Class";
  named.ClassGuidText = withGuid.ClassGuidText = u"text";
  withGuid.ClassGuid = {1, 0, 0, {}};
  const std::string undefined = "InterfaceTypeUndefined";
  EXPECT_EQ(DumpOf(named, u"> "), DumpWith("> SPDRP_CLASS: text\r\n", undefined));
  EXPECT_EQ(DumpOf(withGuid, u"> "), DumpWith("> SPDRP_CLASS: {00000001-0000-0000-0000-000000000000}\r\n", undefined));
  // That names reach one too far, to 17, is deliberate, and so is the name of 17.
  std::istringstream names(
      "InterfaceTypeUndefined Internal Isa Eisa MicroChannel TurboChannel PCIBus VMEBus NuBus PCMCIABus CBus MPIBus "
      "MPSABus ProcessorInternal InternalPowerBus PNPISABus PNPBus MaximumInterfaceType usbhub");
  for (onBus.LegacyBusType = -2; onBus.LegacyBusType <= 18; ++onBus.LegacyBusType) {
    std::string name;
    if (onBus.LegacyBusType >= -1) names >> name;
    EXPECT_EQ(DumpOf(onBus, u"> "), DumpWith("", name)) << onBus.LegacyBusType;
  }
}

TEST(SharedTexts, EqualTextsAreOneCopyThatOutlivesThePool) {
  std::vector<SharedText> texts;
  {
    SharedTexts pool;
    for (const std::u16string_view text : {u"USB", u"usb", u"", u"USB\\", u"USB", u""}) texts.push_back(pool.Of(text));
  }
  SharedText other(u"USB");
  EXPECT_EQ(other, texts[0]);
  EXPECT_NE(other.c_str(), texts[0].c_str());
  EXPECT_EQ(texts[4].c_str(), texts[0].c_str());
  texts[4] = other;
  other.clear();
  EXPECT_TRUE(other.empty() && texts[2].empty() && texts[5].empty() && !texts[0].empty());
  std::u16string all;
  for (const SharedText& text : texts) all.append(text).append(text.c_str()).append(u"|");
  EXPECT_EQ(all, u"USBUSB|usbusb||USB\\USB\\|USBUSB||");
}

}  // namespace
}  // namespace KelvoUHW
