// A port device with a whole configuration, seen through its interfaces.
#include "com/port_device_node.h"

#include "tests/support/com_objects.h"
#include "tests/support/port_records.h"

namespace KelvoUHW {
namespace {

// Three interfaces, one of them in the longer form; a second configuration and an interface that is cut off do not
// count.
std::unique_ptr<DescriptorRequest> Configuration() {
  auto request = std::make_unique<DescriptorRequest>();
  request->Data = {
      9,  2,    90,   0, 3,  1,    4,    0xA0, 0x32,        // configuration
      9,  4,    0,    0, 2,  8,    6,    0x50, 4,           // mass storage
      7,  5,    0x81, 2, 0,  2,    0,                       // bulk in
      7,  5,    2,    2, 0,  2,    0,                       // bulk out
      11, 4,    1,    0, 0,  0xE0, 1,    3,    0,    1, 2,  // wireless, 11 bytes
      9,  4,    2,    0, 1,  3,    1,    2,    0,           // mouse
      9,  0x21, 0x11, 1, 33, 1,    0x22, 0x3F, 0,           // HID
      7,  5,    0x83, 3, 8,  0,    10,                      // interrupt in
      9,  2,    9,    0, 7,  1,    4,    0xA0, 0x32,        // configuration
      9,  4,    3,    0, 1,  0xFF, 0xFF,                    // cut off
  };
  return request;
}

class PortDeviceNode : public ComObjects {
 protected:
  static NodePtr MakeDevice() {
    return MakeRecord<CZKUMPortDeviceImpl>(5u, Connection(1), Configuration(), Strings(), u"key", u"descr",
                                           u"USB\\VID_046D&PID_C52B\\7");
  }
  ComPtr<IEnumVARIANT> Descriptors() {
    ComPtr<IEnumVARIANT> list;
    EXPECT_EQ(device->get_InterfaceDescriptors(list.Put()), S_OK);
    return list;
  }
  static ComPtr<IUnknown> NextOf(IEnumVARIANT* list) {
    VARIANT element{};
    list->Next(1, &element, nullptr);
    EXPECT_TRUE(element.vt == VT_UNKNOWN || element.vt == VT_EMPTY);
    return ComPtr<IUnknown>::Attach(element.punkVal);
  }
  static std::string ClassOf(IUnknown* descriptor, bool giveOut = true) {
    return NumberOf<&IZKUMInterfaceDescr::get_InterfaceClass>(descriptor, giveOut) + ", " +
           NumberOf<&IZKUMInterfaceDescr::get_InterfaceSubClass>(descriptor, giveOut) + ", " +
           NumberOf<&IZKUMInterfaceDescr::get_InterfaceProtocol>(descriptor, giveOut);
  }
  static std::string Classes(IEnumVARIANT* list) {
    std::string classes;
    for (auto next = NextOf(list); next; next = NextOf(list)) classes += ClassOf(next.Get()) + "; ";
    return classes;
  }

  static constexpr char kAll[] = "S_OK 8, S_OK 6, S_OK 80; S_OK 224, S_OK 1, S_OK 3; S_OK 3, S_OK 1, S_OK 2; ";
  NodePtr record = MakeDevice();
  ComPtr<IZKUMPortDevice> device = Wrap(record).As<IZKUMPortDevice>();
};

TEST_F(PortDeviceNode, ShowsWhatTheDeviceSaysOfItself) {
  IUnknown* object = device.Get();
  EXPECT_EQ(TextOf(&Read<&IZKUMPortDevice::get_Manufacturer1>, object), "S_OK SanDisk");
  EXPECT_EQ(TextOf(&Read<&IZKUMPortDevice::get_Product>, object), "S_OK Extreme");
  EXPECT_EQ(TextOf(&Read<&IZKUMUsbDevice::get_SerialNumber>, object), "S_OK AA01");
  EXPECT_EQ(NumberOf<&IZKUMPortDevice::get_Speed>(object), "S_OK 2");
  EXPECT_EQ(NumberOf<&IZKUMPortDevice::get_NumberInterfaces>(object), "S_OK 3");
  EXPECT_EQ(Classes(Descriptors().Get()), kAll);
  const auto first = NextOf(Descriptors().Get());
  EXPECT_EQ(ClassOf(first.Get(), false), "E_INVALIDARG, E_INVALIDARG, E_INVALIDARG");
}

TEST_F(PortDeviceNode, CollectionIsRefilledUnderOlderEnumerators) {
  const auto older = Descriptors();
  const auto first = NextOf(older.Get());
  EXPECT_EQ(older->Skip(1), S_OK);
  ComPtr<IEnumVARIANT> clone;
  ASSERT_EQ(older->Clone(clone.Put()), S_OK);

  // Also for a null pointer: the descriptors are new objects.
  EXPECT_EQ(device->get_InterfaceDescriptors(nullptr), E_POINTER);
  EXPECT_EQ(References(first.Get()), 1u);
  EXPECT_EQ(ClassOf(NextOf(older.Get()).Get()), "S_OK 3, S_OK 1, S_OK 2");
  EXPECT_EQ(older->Reset(), S_OK);
  const auto again = NextOf(older.Get());
  EXPECT_NE(again.Get(), first.Get());
  EXPECT_EQ(ClassOf(again.Get()), ClassOf(first.Get()));
  EXPECT_EQ(Classes(clone.Get()), "S_OK 3, S_OK 1, S_OK 2; ");

  // Fewer than before, under an enumerator that stands behind them.
  auto& entries = static_cast<CZKUMPortDeviceImpl&>(*record).m_interfaceDescrs;
  entries.resize(1);
  const auto newer = Descriptors();
  EXPECT_FALSE(NextOf(clone.Get()));
  EXPECT_EQ(Classes(newer.Get()), "S_OK 8, S_OK 6, S_OK 80; ");
}

TEST_F(PortDeviceNode, EnumeratorKeepsTheRecordAndADescriptorItsBytes) {
  EXPECT_EQ(record.RingSize(), 3u);  // with the object's two
  auto list = Descriptors();
  const auto descriptor = NextOf(list.Get());
  EXPECT_EQ(record.RingSize(), 5u);
  // The collection has died with its object; the enumerator, no longer used, still has the record.
  device.Reset();
  EXPECT_EQ(record.RingSize(), 3u);
  list.Reset();
  EXPECT_EQ(record.RingSize(), 1u);
  record.Reset();
  EXPECT_EQ(ClassOf(descriptor.Get()), "S_OK 8, S_OK 6, S_OK 80");
}

// The n-th object that is made cannot be: three descriptors, the owner, the enumerator.
TEST_F(PortDeviceNode, CollectionWithoutItsObjects) {
  const auto older = Descriptors();
  for (std::uint64_t call = 1; call <= 5; ++call) {
    platform::controls::FailCriticalSection(call, E_ACCESSDENIED);
    auto* list = Mark<IEnumVARIANT>();
    EXPECT_EQ(device->get_InterfaceDescriptors(&list), E_ACCESSDENIED) << call;
    EXPECT_EQ(list, nullptr);
    // What has been made so far is what an older enumerator walks.
    EXPECT_EQ(older->Reset(), S_OK);
    EXPECT_EQ(older->Skip(9), S_FALSE);
  }
  EXPECT_EQ(Classes(Descriptors().Get()), kAll);
}

}  // namespace
}  // namespace KelvoUHW
