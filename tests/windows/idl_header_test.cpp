// The headers that programs include, against the one that the IDL compiler makes of the IDL: every slot, type and
// value, as the machine has them. What has a name in only one of the two does not compile here. This file is compiled
// twice: for the component's own header, and, with ZKUSB_HANDED_OUT, for those that other programs include.
#include <windows.h>

// What the made header includes has to be there before it stands in a namespace.
#include <gtest/gtest.h>
#include <ole2.h>
#include <rpc.h>
#include <rpcndr.h>

#include <array>
#include <bit>
#include <cstddef>
#include <type_traits>

#ifdef ZKUSB_HANDED_OUT
#include <zkusb_monitor.h>
#define ID_OF(name) __uuidof(::name)
#else
#include "com/zkusb_monitor.h"
#define ID_OF(name) ::name::kIid
#endif

// clang-format off
#define INTERFACES(X) \
  X(IZKUMEventNotifier) X(IZKUMDeviceEvent) X(IZKUMUsbTreeNode) X(IZKUMUsbTreeNodeEnumerator) X(IZKUMUsbDevice) \
  X(IZKUMHostController) X(IZKUMHubDevice) X(IZKUMHubPort) X(IZKUMPortDevice) X(IZKUMInterfaceDescr) \
  X(IZKUMInfoDevice) X(IZKUMInterfaceDevice) X(IZKUMUsbTree)
#define METHODS(X) \
  X(IZKUMDeviceEvent, OnDeviceChanged) X(IZKUMDeviceEvent, UnAdvise) \
  X(IZKUMUsbTreeNode, get_InstanceId) X(IZKUMUsbTreeNode, get_Type) X(IZKUMUsbTreeNode, get_Parent) \
  X(IZKUMUsbTreeNode, get_Childs) X(IZKUMUsbTreeNode, get_InSubtreeDevicesOfType) \
  X(IZKUMUsbTreeNodeEnumerator, MoveNext) X(IZKUMUsbTreeNodeEnumerator, GetCurrent) \
  X(IZKUMUsbDevice, get_Description) X(IZKUMUsbDevice, get_SerialNumber) X(IZKUMUsbDevice, get_VendorId) \
  X(IZKUMUsbDevice, get_ProductId) X(IZKUMUsbDevice, get_DriverKeyName) X(IZKUMUsbDevice, get_ToString) \
  X(IZKUMUsbDevice, get_Vendor) X(IZKUMUsbDevice, get_Product) \
  X(IZKUMHostController, get_LeafName) \
  X(IZKUMHubDevice, get_PathName) X(IZKUMHubDevice, get_ConnectionName) \
  X(IZKUMHubPort, get_PortIndex) \
  X(IZKUMPortDevice, get_Product) X(IZKUMPortDevice, get_Manufacturer1) X(IZKUMPortDevice, get_Speed) \
  X(IZKUMPortDevice, get_NumberInterfaces) X(IZKUMPortDevice, get_InterfaceDescriptors) \
  X(IZKUMPortDevice, get_FirstChildOfType) \
  X(IZKUMInterfaceDescr, get_InterfaceClass) X(IZKUMInterfaceDescr, get_InterfaceSubClass) \
  X(IZKUMInterfaceDescr, get_InterfaceProtocol) \
  X(IZKUMInfoDevice, get_Service) X(IZKUMInfoDevice, get_FriendlyName) X(IZKUMInfoDevice, get_Location) \
  X(IZKUMInfoDevice, get_Manufacturer) X(IZKUMInfoDevice, get_HardwareId) X(IZKUMInfoDevice, get_PhysicalName) \
  X(IZKUMInfoDevice, get_DevClass) X(IZKUMInfoDevice, get_EnumName) X(IZKUMInfoDevice, get_ClassGuid) \
  X(IZKUMInterfaceDevice, get_VolumeName) X(IZKUMInterfaceDevice, get_VendorId) \
  X(IZKUMInterfaceDevice, get_ProductId) X(IZKUMInterfaceDevice, get_ProductRev) \
  X(IZKUMInterfaceDevice, get_DevicePath) X(IZKUMInterfaceDevice, get_MountPoint) \
  X(IZKUMInterfaceDevice, get_MountPoints) \
  X(IZKUMUsbTree, get_RootNode) X(IZKUMUsbTree, get_PortDevicesWithVendorId) \
  X(IZKUMUsbTree, get_VendorProductDevices) X(IZKUMUsbTree, get_PortDevicesWithVolume)
#define VALUES(X) \
  X(KDeviceConnected) X(KDeviceAttached) X(KDeviceRemoved) X(KDeviceModified) \
  X(KUDTUnknown) X(KUDTRoot) X(KUDTHostController) X(KUDTHub) X(KUDTHubPort) X(KUDTPortDevice) X(KUDTInfoDevice) \
  X(KUDTInterfaceDevice)
// clang-format on

// The tables of methods as structures of pointers; identifiers as constants; nothing outside the namespace.
#define CINTERFACE
#undef DEFINE_GUID
#define DEFINE_GUID(name, a, b, c, ...)         \
  [[maybe_unused]] static constexpr GUID name { \
    a, b, c, { __VA_ARGS__ }                    \
  }
#undef __CRT_UUID_DECL
namespace made {
// So that no name stands for that of the other header.
#define DECLARE(name) struct name;
INTERFACES(DECLARE)
#undef DECLARE
struct IZKDeviceEventCallBack;
class ZKUMEventNotifier;
class ZKUMUsbTree;
#include <zkusb_monitor_made.h>
}  // namespace made

#ifdef ZKUSB_HANDED_OUT
// Here its constants are the namespace's own.
#undef DECLSPEC_SELECTANY
#define DECLSPEC_SELECTANY
namespace in_c {
#define DECLARE(name) struct name;
INTERFACES(DECLARE)
#undef DECLARE
#include <zkusb_monitor_c.h>
}  // namespace in_c
#endif

namespace {

// The header's type for one of the made header's.
template <class T>
struct Ours {
  using Type = T;
};
template <class T>
struct Ours<T*> {
  using Type = typename Ours<T>::Type*;
};
#define SAME_NAME(name)     \
  template <>               \
  struct Ours<made::name> { \
    using Type = ::name;    \
  };
INTERFACES(SAME_NAME)
SAME_NAME(TDeviceEventType)
SAME_NAME(_TUsbDeviceType)
#ifdef ZKUSB_HANDED_OUT
#define SAME_NAME_IN_C(name) \
  template <>                \
  struct Ours<in_c::name> {  \
    using Type = ::name;     \
  };
INTERFACES(SAME_NAME_IN_C)
SAME_NAME_IN_C(TDeviceEventType)
SAME_NAME_IN_C(TUsbDeviceType)
#endif

// A method of the header as the entry of a table: the object comes first. Only the calling convention of COM fits.
template <class Method>
struct Entry;
template <class Interface, class Result, class... Args>
struct Entry<Result (STDMETHODCALLTYPE Interface::*)(Args...)> {
  using Type = Result(STDMETHODCALLTYPE*)(Interface*, Args...);
};
template <class Made>
struct OurEntry;
template <class Result, class... Args>
struct OurEntry<Result(STDMETHODCALLTYPE*)(Args...)> {
  using Type = typename Ours<Result>::Type(STDMETHODCALLTYPE*)(typename Ours<Args>::Type...);
};

// In the ABI of this build a pointer to a virtual method is its place in the table, in bytes, plus one.
template <class Method>
std::size_t SlotOf(Method method) {
  const auto words = std::bit_cast<std::array<std::uintptr_t, 2>>(method);
  EXPECT_EQ(words[0] % sizeof(void*), 1u) << "not virtual";
  return words[0] / sizeof(void*);
}

// Its own method stands behind the last one of the interface.
template <class Interface>
struct OneMore : Interface {
  virtual void STDMETHODCALLTYPE Behind() = 0;
};

template <class Table>
constexpr std::size_t kSlots = sizeof(Table) / sizeof(void*);

constexpr std::size_t kIUnknownSlots = 3;

TEST(IdlHeader, HasTheInterfacesOfTheHeader) {
  std::size_t methods = 0;
#define COMPARE(name)                                                                                \
  EXPECT_TRUE(made::IID_##name == ID_OF(name)) << #name;                                             \
  EXPECT_TRUE((std::is_base_of_v<IUnknown, ::name>)) << #name;                                       \
  EXPECT_EQ(offsetof(made::name##Vtbl, AddRef) / sizeof(void*), SlotOf(&::name::AddRef)) << #name;   \
  EXPECT_EQ(offsetof(made::name##Vtbl, Release) / sizeof(void*), SlotOf(&::name::Release)) << #name; \
  EXPECT_EQ(kSlots<made::name##Vtbl>, SlotOf(&OneMore<::name>::Behind)) << #name;                    \
  methods += kSlots<made::name##Vtbl> - kIUnknownSlots;
  INTERFACES(COMPARE)
#undef COMPARE
  // So that the comparison of methods leaves none out.
#define COUNT(interface, method) +1
  EXPECT_EQ(methods, std::size_t{0} METHODS(COUNT));
#undef COUNT
}

TEST(IdlHeader, HasTheMethodsOfTheHeader) {
#define COMPARE(name, method)                                                                                       \
  EXPECT_EQ(offsetof(made::name##Vtbl, method) / sizeof(void*), SlotOf(&::name::method)) << #name "::" #method;     \
  EXPECT_TRUE(                                                                                                      \
      (std::is_same_v<OurEntry<decltype(made::name##Vtbl::method)>::Type, Entry<decltype(&::name::method)>::Type>)) \
      << #name "::" #method;
  METHODS(COMPARE)
#undef COMPARE
}

TEST(IdlHeader, HasTheValuesOfTheHeader) {
#define COMPARE(value)                                                           \
  EXPECT_EQ(static_cast<int>(made::value), static_cast<int>(::value)) << #value; \
  EXPECT_TRUE((std::is_same_v<Ours<decltype(made::value)>::Type, decltype(::value)>)) << #value;
  VALUES(COMPARE)
#undef COMPARE
  EXPECT_EQ(sizeof(made::TDeviceEventType), sizeof(::TDeviceEventType));
  EXPECT_EQ(sizeof(made::TUsbDeviceType), sizeof(::TUsbDeviceType));
  EXPECT_TRUE(made::LIBID_ZKUsbMonitorLib == ::LIBID_ZKUsbMonitorLib);
  EXPECT_TRUE(made::CLSID_ZKUMEventNotifier == ::CLSID_ZKUMEventNotifier);
  EXPECT_TRUE(made::CLSID_ZKUMUsbTree == ::CLSID_ZKUMUsbTree);
  EXPECT_TRUE(made::DIID_IZKDeviceEventCallBack == ::DIID_IZKDeviceEventCallBack);
}

#ifdef ZKUSB_HANDED_OUT
TEST(IdlHeader, HasWhatTheHeaderForCHas) {
#define COMPARE(name)                                                                           \
  EXPECT_TRUE(made::IID_##name == in_c::IID_##name) << #name;                                   \
  EXPECT_EQ(kSlots<made::name##Vtbl>, kSlots<in_c::name##Vtbl>) << #name;                       \
  EXPECT_EQ(offsetof(made::name##Vtbl, Release), offsetof(in_c::name##Vtbl, Release)) << #name; \
  EXPECT_EQ(sizeof(in_c::name), sizeof(void*)) << #name;
  INTERFACES(COMPARE)
#undef COMPARE
#define COMPARE(name, method)                                                                              \
  EXPECT_EQ(offsetof(made::name##Vtbl, method), offsetof(in_c::name##Vtbl, method)) << #name "::" #method; \
  EXPECT_TRUE((std::is_same_v<OurEntry<decltype(made::name##Vtbl::method)>::Type,                          \
                              OurEntry<decltype(in_c::name##Vtbl::method)>::Type>))                        \
      << #name "::" #method;
  METHODS(COMPARE)
#undef COMPARE
#define COMPARE(value) EXPECT_EQ(static_cast<int>(made::value), static_cast<int>(in_c::value)) << #value;
  VALUES(COMPARE)
#undef COMPARE
  EXPECT_TRUE(made::LIBID_ZKUsbMonitorLib == in_c::LIBID_ZKUsbMonitorLib);
  EXPECT_TRUE(made::CLSID_ZKUMEventNotifier == in_c::CLSID_ZKUMEventNotifier);
  EXPECT_TRUE(made::CLSID_ZKUMUsbTree == in_c::CLSID_ZKUMUsbTree);
  EXPECT_TRUE(made::DIID_IZKDeviceEventCallBack == in_c::DIID_IZKDeviceEventCallBack);
}

// The other ways to the identifiers: those of C++ itself, and constants.
TEST(IdlHeader, GivesEachTypeItsIdentifier) {
#define COMPARE(name) EXPECT_TRUE(made::IID_##name == ::IID_##name) << #name;
  INTERFACES(COMPARE)
#undef COMPARE
  EXPECT_TRUE(made::CLSID_ZKUMEventNotifier == __uuidof(ZKUMEventNotifier));
  EXPECT_TRUE(made::CLSID_ZKUMUsbTree == __uuidof(ZKUMUsbTree));
  EXPECT_TRUE(made::DIID_IZKDeviceEventCallBack == __uuidof(IZKDeviceEventCallBack));
}
#endif

}  // namespace
