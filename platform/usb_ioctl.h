// Requests to USB host controllers and hubs: codes and records.
//
// Public source: the published driver-kit headers usbioctl.h, usbiodef.h and usb100.h, and
// chapter 9 of the USB 2.0 standard for the descriptors. All records are byte-packed and
// little-endian; their layout is the same in 32-bit and 64-bit programs.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

namespace platform {

// Device type FILE_DEVICE_USB, buffered, any access. The root-hub name and the node information
// share one code: which one is meant follows from the handle, a host controller or a hub.
inline constexpr std::uint32_t kIOCTL_GET_HCD_DRIVERKEY_NAME = 0x220424;
inline constexpr std::uint32_t kIOCTL_USB_GET_ROOT_HUB_NAME = 0x220408;
inline constexpr std::uint32_t kIOCTL_USB_GET_NODE_INFORMATION = 0x220408;
inline constexpr std::uint32_t kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION = 0x22040C;
inline constexpr std::uint32_t kIOCTL_USB_GET_NODE_CONNECTION_NAME = 0x220414;
inline constexpr std::uint32_t kIOCTL_USB_GET_NODE_CONNECTION_DRIVERKEY_NAME = 0x220420;
inline constexpr std::uint32_t kIOCTL_USB_GET_NODE_CONNECTION_INFORMATION_EX = 0x220448;

// Values of ConnectionStatus; a driver may answer others.
inline constexpr std::uint32_t NoDeviceConnected = 0;
inline constexpr std::uint32_t DeviceConnected = 1;

// Values of Speed.
inline constexpr std::uint8_t UsbLowSpeed = 0;
inline constexpr std::uint8_t UsbFullSpeed = 1;
inline constexpr std::uint8_t UsbHighSpeed = 2;

// Values of bDescriptorType.
inline constexpr std::uint8_t kUSB_DEVICE_DESCRIPTOR_TYPE = 0x01;
inline constexpr std::uint8_t kUSB_CONFIGURATION_DESCRIPTOR_TYPE = 0x02;
inline constexpr std::uint8_t kUSB_STRING_DESCRIPTOR_TYPE = 0x03;
inline constexpr std::uint8_t kUSB_INTERFACE_DESCRIPTOR_TYPE = 0x04;
inline constexpr std::uint8_t kUSB_ENDPOINT_DESCRIPTOR_TYPE = 0x05;
inline constexpr std::uint8_t kUSB_HID_DESCRIPTOR_TYPE = 0x21;

#pragma pack(push, 1)

struct USB_DEVICE_DESCRIPTOR {
  std::uint8_t bLength;
  std::uint8_t bDescriptorType;
  std::uint16_t bcdUSB;
  std::uint8_t bDeviceClass;
  std::uint8_t bDeviceSubClass;
  std::uint8_t bDeviceProtocol;
  std::uint8_t bMaxPacketSize0;
  std::uint16_t idVendor;
  std::uint16_t idProduct;
  std::uint16_t bcdDevice;
  std::uint8_t iManufacturer;
  std::uint8_t iProduct;
  std::uint8_t iSerialNumber;
  std::uint8_t bNumConfigurations;
};

struct USB_CONFIGURATION_DESCRIPTOR {
  std::uint8_t bLength;
  std::uint8_t bDescriptorType;
  std::uint16_t wTotalLength;
  std::uint8_t bNumInterfaces;
  std::uint8_t bConfigurationValue;
  std::uint8_t iConfiguration;
  std::uint8_t bmAttributes;
  std::uint8_t MaxPower;
};

struct USB_INTERFACE_DESCRIPTOR {
  std::uint8_t bLength;
  std::uint8_t bDescriptorType;
  std::uint8_t bInterfaceNumber;
  std::uint8_t bAlternateSetting;
  std::uint8_t bNumEndpoints;
  std::uint8_t bInterfaceClass;
  std::uint8_t bInterfaceSubClass;
  std::uint8_t bInterfaceProtocol;
  std::uint8_t iInterface;
};

struct USB_ENDPOINT_DESCRIPTOR {
  std::uint8_t bLength;
  std::uint8_t bDescriptorType;
  std::uint8_t bEndpointAddress;
  std::uint8_t bmAttributes;
  std::uint16_t wMaxPacketSize;
  std::uint8_t bInterval;
};

struct USB_PIPE_INFO {
  USB_ENDPOINT_DESCRIPTOR EndpointDescriptor;
  std::uint32_t ScheduleOffset;
};

struct USB_NODE_CONNECTION_INFORMATION_EX {
  std::uint32_t ConnectionIndex;
  USB_DEVICE_DESCRIPTOR DeviceDescriptor;
  std::uint8_t CurrentConfigurationValue;
  std::uint8_t Speed;
  std::uint8_t DeviceIsHub;
  std::uint16_t DeviceAddress;
  std::uint32_t NumberOfOpenPipes;
  std::uint32_t ConnectionStatus;
  // The pipe list follows.
};

// The older record: LowSpeed, zero or not, stands where the newer one has Speed.
struct USB_NODE_CONNECTION_INFORMATION {
  std::uint32_t ConnectionIndex;
  USB_DEVICE_DESCRIPTOR DeviceDescriptor;
  std::uint8_t CurrentConfigurationValue;
  std::uint8_t LowSpeed;
  std::uint8_t DeviceIsHub;
  std::uint16_t DeviceAddress;
  std::uint32_t NumberOfOpenPipes;
  std::uint32_t ConnectionStatus;
  // The pipe list follows.
};

inline constexpr std::size_t kConnectionPipes = 30;

// Either record with room for 30 pipes: 365 bytes, the size of every connection request made.
template <class Head>
struct WithPipeList {
  Head Info;
  std::array<USB_PIPE_INFO, kConnectionPipes> PipeList;
};
using ConnectionInformationEx = WithPipeList<USB_NODE_CONNECTION_INFORMATION_EX>;
using LegacyConnectionInformation = WithPipeList<USB_NODE_CONNECTION_INFORMATION>;

struct USB_HUB_DESCRIPTOR {
  std::uint8_t bDescriptorLength;
  std::uint8_t bDescriptorType;
  std::uint8_t bNumberOfPorts;
  std::uint16_t wHubCharacteristics;
  std::uint8_t bPowerOnToPowerGood;
  std::uint8_t bHubControlCurrent;
  std::array<std::uint8_t, 64> bRemoveAndPowerMask;
};

struct USB_NODE_INFORMATION {
  std::uint32_t NodeType;  // 0: a hub
  USB_HUB_DESCRIPTOR HubDescriptor;
  std::uint8_t HubIsBusPowered;
};

// The heads of the name records, without the text that follows. ActualLength counts the whole
// record in bytes, head and terminating zero included.
struct UsbNameHead {  // USB_HCD_DRIVERKEY_NAME, USB_ROOT_HUB_NAME
  std::uint32_t ActualLength;
};
struct UsbConnectionNameHead {  // USB_NODE_CONNECTION_NAME, USB_NODE_CONNECTION_DRIVERKEY_NAME
  std::uint32_t ConnectionIndex;
  std::uint32_t ActualLength;
};

struct USB_DESCRIPTOR_REQUEST_HEAD {  // the descriptor's bytes follow
  std::uint32_t ConnectionIndex;
  std::uint8_t bmRequest;
  std::uint8_t bRequest;
  std::uint16_t wValue;
  std::uint16_t wIndex;
  std::uint16_t wLength;
};

#pragma pack(pop)

static_assert(sizeof(USB_DEVICE_DESCRIPTOR) == 18);
static_assert(sizeof(USB_CONFIGURATION_DESCRIPTOR) == 9);
static_assert(sizeof(USB_INTERFACE_DESCRIPTOR) == 9);
static_assert(sizeof(USB_ENDPOINT_DESCRIPTOR) == 7);
static_assert(sizeof(USB_PIPE_INFO) == 11);
static_assert(sizeof(USB_NODE_CONNECTION_INFORMATION_EX) == 35);
static_assert(sizeof(USB_NODE_CONNECTION_INFORMATION) == 35);
static_assert(sizeof(ConnectionInformationEx) == 365);
static_assert(sizeof(LegacyConnectionInformation) == 365);
static_assert(sizeof(USB_NODE_INFORMATION) == 76);
static_assert(sizeof(USB_DESCRIPTOR_REQUEST_HEAD) == 12);

// The sizes of the published name records: the head and the one character they declare.
inline constexpr std::uint32_t kNameRecordSize = sizeof(UsbNameHead) + sizeof(char16_t);
inline constexpr std::uint32_t kConnectionNameRecordSize =
    sizeof(UsbConnectionNameHead) + sizeof(char16_t);
static_assert(kNameRecordSize == 6 && kConnectionNameRecordSize == 10);

}  // namespace platform
