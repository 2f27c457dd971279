// Devices that are opened as files, and their requests.
#include <usbioctl.h>
#include <winioctl.h>

#include <algorithm>

#include "simulation/abi/state.h"

namespace abi_pc {
namespace {

// The records' sizes as the drivers' documentation has them, of both widths.
static_assert(sizeof(USB_NODE_CONNECTION_INFORMATION_EX) == 35 &&
              sizeof(USB_NODE_INFORMATION) == 76);
static_assert(sizeof(USB_DEVICE_DESCRIPTOR) == 18 && sizeof(USB_PIPE_INFO) == 11);
static_assert(offsetof(USB_ROOT_HUB_NAME, RootHubName) == 4 &&
              offsetof(USB_NODE_CONNECTION_NAME, NodeName) == 8);
static_assert(sizeof(STORAGE_DEVICE_DESCRIPTOR) == 40 &&
              offsetof(STORAGE_DEVICE_DESCRIPTOR, RawDeviceProperties) == 36);
static_assert(sizeof(STORAGE_DEVICE_NUMBER) == 12);
constexpr std::size_t kSerialNumberOffset = 16;  // of the characters in MEDIA_SERIAL_NUMBER_DATA
constexpr DWORD kMediaSerialNumber = 0x2D0C10;

// What a driver has of a request: one buffer for input and output, as long as the longer of them.
// What is beyond the input was never cleared.
struct Request {
  DWORD code;
  std::string buffer;
  std::size_t in, out;

  template <class Record>
  Record Read() const {
    Record record{};
    std::memcpy(&record, buffer.data(), std::min(sizeof record, in));
    return record;
  }
  void Write(std::size_t offset, const void* bytes, std::size_t count) {
    if (offset < out) std::memcpy(buffer.data() + offset, bytes, std::min(count, out - offset));
  }
};

// What a driver answers: an error, or the number of bytes that are copied back.
struct Answer {
  DWORD error;
  std::size_t bytes;
};
constexpr Answer Refused(DWORD error) { return {error, 0}; }

// The size of the whole record and as much of it as there is room for: the text, or none of it.
Answer AnswerName(Request& request, std::size_t head, const std::u16string& name) {
  const std::size_t text = (name.size() + 1) * sizeof(WCHAR);
  if (request.out < head + sizeof(WCHAR)) return Refused(ERROR_INSUFFICIENT_BUFFER);
  const ULONG whole = static_cast<ULONG>(head + text);
  request.Write(head - sizeof whole, &whole, sizeof whole);
  if (whole <= request.out) return request.Write(head, name.c_str(), text), Answer{0, whole};
  constexpr WCHAR kNothing = 0;
  return request.Write(head, &kNothing, sizeof kNothing), Answer{0, head + sizeof kNothing};
}

Answer AnswerController(const sim::HostController& controller, Request& request) {
  const auto& name =
      request.code == IOCTL_USB_GET_ROOT_HUB_NAME ? controller.rootHub : controller.driverKey;
  if (request.code != IOCTL_USB_GET_ROOT_HUB_NAME && request.code != IOCTL_GET_HCD_DRIVERKEY_NAME) {
    return Refused(ERROR_INVALID_FUNCTION);
  }
  return name ? AnswerName(request, offsetof(USB_ROOT_HUB_NAME, RootHubName), *name)
              : Refused(ERROR_INVALID_PARAMETER);
}

Answer AnswerNode(const sim::Hub& hub, Request& request) {
  if (request.out < sizeof(USB_NODE_INFORMATION)) return Refused(ERROR_INSUFFICIENT_BUFFER);
  USB_NODE_INFORMATION node{};
  node.NodeType = UsbHub;
  auto& descriptor = node.u.HubInformation.HubDescriptor;
  descriptor.bDescriptorLength = static_cast<UCHAR>(7 + 2 * (hub.ports.size() / 8 + 1));
  descriptor.bDescriptorType = 0x29;
  descriptor.bNumberOfPorts = static_cast<UCHAR>(hub.ports.size());
  node.u.HubInformation.HubIsBusPowered = hub.busPowered;
  return request.Write(0, &node, sizeof node), Answer{0, sizeof node};
}

Answer AnswerConnection(const sim::Port& port, ULONG number, Request& request) {
  if (request.out < sizeof(USB_NODE_CONNECTION_INFORMATION_EX))
    return Refused(ERROR_INSUFFICIENT_BUFFER);
  USB_NODE_CONNECTION_INFORMATION_EX head{};
  head.ConnectionIndex = number;
  std::memcpy(&head.DeviceDescriptor, &port.descriptor, sizeof head.DeviceDescriptor);
  head.ConnectionStatus = static_cast<USB_CONNECTION_STATUS>(port.status);
  if (port.status != NoDeviceConnected) {
    head.DeviceDescriptor.bLength = 18;
    head.DeviceDescriptor.bDescriptorType = 1;
  }
  head.CurrentConfigurationValue = port.configuration;
  // The older request says only whether it is low speed.
  const auto speed = static_cast<UCHAR>(port.speed);  // low, full, high, super: 0 to 3
  head.Speed = request.code == IOCTL_USB_GET_NODE_CONNECTION_INFORMATION_EX ? speed : speed == 0;
  head.DeviceIsHub = port.isHub;
  head.DeviceAddress = port.address;
  head.NumberOfOpenPipes = static_cast<ULONG>(port.pipes.size());
  request.Write(0, &head, sizeof head);
  const std::size_t pipes =
      std::min(port.pipes.size(), (request.out - sizeof head) / sizeof(USB_PIPE_INFO));
  request.Write(sizeof head, port.pipes.data(), pipes * sizeof(USB_PIPE_INFO));
  return {0, sizeof head + pipes * sizeof(USB_PIPE_INFO)};
}

Answer AnswerHub(const sim::Hub& hub, Request& request) {
  if (request.code == IOCTL_USB_GET_NODE_INFORMATION) return AnswerNode(hub, request);
  if (request.code != IOCTL_USB_GET_NODE_CONNECTION_INFORMATION &&
      request.code != IOCTL_USB_GET_NODE_CONNECTION_INFORMATION_EX &&
      request.code != IOCTL_USB_GET_NODE_CONNECTION_NAME &&
      request.code != IOCTL_USB_GET_NODE_CONNECTION_DRIVERKEY_NAME) {
    return Refused(ERROR_INVALID_FUNCTION);
  }
  const ULONG number = request.Read<ULONG>();
  if (request.in < sizeof number) return Refused(ERROR_INSUFFICIENT_BUFFER);
  if (number == 0 || number > hub.ports.size()) return Refused(ERROR_INVALID_PARAMETER);
  const sim::Port& port = hub.ports[number - 1];
  constexpr std::size_t kHead = offsetof(USB_NODE_CONNECTION_NAME, NodeName);
  switch (request.code) {
    case IOCTL_USB_GET_NODE_CONNECTION_NAME:
      return AnswerName(request, kHead, port.hubName.value_or(std::u16string()));
    case IOCTL_USB_GET_NODE_CONNECTION_DRIVERKEY_NAME:
      return port.driverKey ? AnswerName(request, kHead, *port.driverKey)
                            : Refused(ERROR_INVALID_PARAMETER);
    default:
      return AnswerConnection(port, number, request);
  }
}

Answer AnswerProperty(const sim::Storage& storage, Request& request) {
  if (request.in < 8) return Refused(ERROR_BAD_LENGTH);
  const auto query = request.Read<STORAGE_PROPERTY_QUERY>();
  if (query.PropertyId != StorageDeviceProperty || query.QueryType != PropertyStandardQuery) {
    return Refused(ERROR_INVALID_PARAMETER);
  }
  if (!storage.deviceType) return Refused(ERROR_INVALID_FUNCTION);
  STORAGE_DEVICE_DESCRIPTOR head{};
  std::string texts;
  const auto add = [&](const std::optional<std::string>& text, DWORD& offset) {
    if (!text) return;
    offset = static_cast<DWORD>(36 + texts.size());
    texts += *text + '\0';
  };
  add(storage.vendor, head.VendorIdOffset);
  add(storage.product, head.ProductIdOffset);
  add(storage.revision, head.ProductRevisionOffset);
  add(storage.serial, head.SerialNumberOffset);
  head.Version = sizeof head;
  head.Size = static_cast<DWORD>(36 + texts.size());
  head.DeviceType = *storage.deviceType;
  head.DeviceTypeModifier = storage.deviceTypeModifier;
  head.RemovableMedia = storage.removable;
  if (request.out < 8) return Refused(ERROR_INSUFFICIENT_BUFFER);
  request.Write(0, &head, 36);
  request.Write(36, texts.data(), texts.size());
  return {0, request.out < 36 ? 8 : std::min<std::size_t>(request.out, head.Size)};
}

Answer AnswerSerialNumber(const sim::Storage& storage, Request& request) {
  if (!storage.mediaSerialNumber) return Refused(ERROR_NOT_SUPPORTED);
  const ULONG text = static_cast<ULONG>((storage.mediaSerialNumber->size() + 1) * sizeof(WCHAR));
  if (request.out < sizeof text) return Refused(ERROR_INSUFFICIENT_BUFFER);
  request.Write(0, &text, sizeof text);
  if (request.out < kSerialNumberOffset + text) return {0, sizeof text};
  constexpr ULONG kNothing[3] = {};
  request.Write(4, kNothing, sizeof kNothing);
  request.Write(kSerialNumberOffset, storage.mediaSerialNumber->c_str(), text);
  return {0, kSerialNumberOffset + text};
}

Answer AnswerStorage(const sim::Storage& storage, Request& request) {
  switch (request.code) {
    case IOCTL_STORAGE_QUERY_PROPERTY:
      return AnswerProperty(storage, request);
    case kMediaSerialNumber:
      return AnswerSerialNumber(storage, request);
    case IOCTL_STORAGE_GET_DEVICE_NUMBER: {
      if (!storage.deviceNumber) return Refused(ERROR_INVALID_FUNCTION);
      const auto& own = *storage.deviceNumber;
      const STORAGE_DEVICE_NUMBER number{own.type, own.number, own.partition};
      if (request.out < sizeof number) return Refused(ERROR_INSUFFICIENT_BUFFER);
      return request.Write(0, &number, sizeof number), Answer{0, sizeof number};
    }
    default:
      return Refused(ERROR_INVALID_FUNCTION);
  }
}

Answer AnswerFile(const Now& now, const File& file, Request& request) {
  switch (file.kind) {
    case FileKind::Controller:
      return AnswerController(now.machine.hostControllers[now.index.Controller(file.name)],
                              request);
    case FileKind::Hub:
      return AnswerHub(now.machine.hubs[now.index.Hub(file.name)], request);
    default:
      const Position storage = now.index.Storage(file.name);
      return storage == kNone ? Refused(ERROR_INVALID_FUNCTION)
                              : AnswerStorage(now.machine.storage[storage], request);
  }
}

// A symbolic name of a hub opens in both namespaces, as a device interface does.
std::optional<File> Named(const Index& index, const std::u16string& name, DWORD access) {
  if (index.Controller(name) != kNone) return File{FileKind::Controller, name, access};
  const std::u16string symbolic = name.substr(std::min<std::size_t>(4, name.size()));
  if (index.Hub(symbolic) != kNone) return File{FileKind::Hub, symbolic, access};
  const bool storage =
      index.Interface(name) != kNone || (sim::IsDriveName(name) && index.Drive(name[4]) != kNone);
  return storage ? std::optional(File{FileKind::Storage, name, access}) : std::nullopt;
}

HANDLE WINAPI OpenFile(LPCWSTR path, DWORD access, DWORD share, LPSECURITY_ATTRIBUTES security,
                       DWORD disposition, DWORD attributes, HANDLE pattern) {
  const Call call("CreateFileW");
  const auto refuse = [&](DWORD code) { return call.Refuse(code), INVALID_HANDLE_VALUE; };
  const std::u16string name = Lowered(Units(path));
  call.Want(disposition == 3, "the disposition is not OPEN_EXISTING");
  call.Want(security == nullptr && attributes == 0 && pattern == nullptr,
            "security, attributes or a template");
  if (call.Fails()) return refuse(ERROR_GEN_FAILURE);
  const std::optional<File> file = Named(call.Machine().index, name, access);
  if (!file) {
    call.Want(name.starts_with(u"\\\\.\\") || name.starts_with(u"\\\\?\\"), "not a device");
    return refuse(ERROR_FILE_NOT_FOUND);
  }
  // USB drivers are opened for writing and shared for writing, disks for nothing and shared for
  // all: the system itself has them open, and who is no administrator may not do more.
  const Position entry = call.Machine().index.Interface(name);
  const bool disk = entry != kNone &&
                    call.Machine().machine.interfaces[entry].interfaceClass.Data1 >> 8 == 0x53F563;
  const bool usb = file->kind != FileKind::Storage && !(disk && access == 0);
  if (share != (usb ? 2u : 3u)) return call.Breach("the share"), refuse(ERROR_SHARING_VIOLATION);
  if (access != (usb ? 0x40000000u : 0u))
    return call.Breach("the access"), refuse(ERROR_ACCESS_DENIED);
  return call.Opened(*file);
}

bool IsOurs(HANDLE handle) {
  return reinterpret_cast<std::uintptr_t>(handle) - kFirstHandle < 0x1000000;
}

BOOL WINAPI Control(HANDLE handle, DWORD code, LPVOID in, DWORD inBytes, LPVOID out, DWORD outBytes,
                    LPDWORD returned, LPOVERLAPPED overlapped) {
  const Call call("DeviceIoControl");
  call.Want(overlapped == nullptr, "an overlapped request");
  if (!call.Want(returned != nullptr, "nowhere to say how much was returned"))
    return call.Refuse(ERROR_NOACCESS);
  // The component asks a disk for its property when it has just closed it. That is published, and
  // deliberate.
  if (handle == INVALID_HANDLE_VALUE && code == IOCTL_STORAGE_QUERY_PROPERTY)
    return call.Refuse(ERROR_INVALID_HANDLE);
  const File* const file = call.Find<File>(handle);
  if (file == nullptr) return call.Refuse(ERROR_INVALID_HANDLE);
  // The lowest two bits say how buffers go, bits 14 and 15 for what the file must have been opened.
  call.Want((code & 3) == 0, "a method that is not buffered");
  const bool reads = (code & 0x4000) != 0, writes = (code & 0x8000) != 0;
  if ((reads && (file->access & GENERIC_READ) == 0) ||
      (writes && (file->access & GENERIC_WRITE) == 0)) {
    return call.Misused(ERROR_ACCESS_DENIED, "a request for which the file was not opened");
  }
  if ((in == nullptr) != (inBytes == 0) || (out == nullptr) != (outBytes == 0)) {
    return call.Misused(ERROR_NOACCESS, "a size without a buffer, or a buffer without a size");
  }
  if (call.Fails()) return call.Refuse(ERROR_GEN_FAILURE);
  if (file->gone) return call.Refuse(ERROR_DEVICE_NOT_CONNECTED);
  Request request{code, std::string(std::max(inBytes, outBytes), static_cast<char>(kGarbage)),
                  inBytes, outBytes};
  if (inBytes != 0) std::memcpy(request.buffer.data(), in, inBytes);
  const Answer answer = AnswerFile(call.Machine(), *file, request);
  if (answer.error != 0) return call.Refuse(answer.error);
  // Only what was returned is copied back. That all that was offered is the caller's is seen here.
  if (outBytes != 0) {
    static_cast<volatile char*>(out)[outBytes - 1] = static_cast<volatile char*>(out)[outBytes - 1];
    std::memcpy(out, request.buffer.data(), answer.bytes);
  }
  *returned = static_cast<DWORD>(answer.bytes);
  return call.Done();
}

BOOL WINAPI Close(HANDLE handle) {
  if (!IsOurs(handle)) return CloseHandle(handle);  // a thread or an event
  return Call("CloseHandle").Close<File>(handle);
}

}  // namespace

Functions FileFunctions() {
  return {{"CreateFileW", Address(OpenFile)},
          {"DeviceIoControl", Address(Control)},
          {"CloseHandle", Address(Close)}};
}

}  // namespace abi_pc
