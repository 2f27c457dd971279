// Prints one line for each of many made-up PCs: a digest of everything that its builds publish. Two versions of the
// component that answer alike print the same lines: compare the outputs after a change that must not change results.
//
//   zkusb_build_digests [FIRST [COUNT [flaky]]]
//
// Each PC goes through a script of random changes with a build after most of them. Between the PC and the component
// stands a host whose answers are odd in a way that only depends on what is asked, and never on how often or in which
// order: texts too long for any buffer, without their zero, of an odd size or with none, properties that a device
// lacks or that cannot be read, devices without parent, elements that end early; some of it differs from build to
// build, and in some builds every call of one operation fails.
//
// With "flaky", in every other build single calls fail, a question that is repeated is answered otherwise, and texts of
// an odd size are not ASCII. Two versions print the same lines then if they also make the same calls in the same order.
#include <cstring>
#include <iostream>
#include <map>
#include <optional>
#include <set>

#include "platform/text.h"
#include "platform/wrappers/intercepting_host.h"
#include "tests/support/random_pc.h"
#include "tree/tree_builder.h"

namespace {

using namespace KelvoUHW;
using namespace platform;
using wrappers::HostCall, wrappers::Operation;

constexpr std::uint32_t kGeneralFailure = 31, kCmFailure = 0x13;

std::uint64_t Mix(std::uint64_t a, std::uint64_t b) {
  a = (a ^ b) * 0x9E3779B97F4A7C15u;
  return (a ^ (a >> 29)) * 0xBF58476D1CE4E5B9u ^ (a >> 32);
}
std::uint64_t HashText(std::u16string_view text) {
  std::uint64_t hash = 17;
  for (const char16_t unit : text) hash = Mix(hash, unit);
  return hash;
}

class OddHost final : public wrappers::InterceptingHost {
 public:
  OddHost(Host& base, std::uint32_t seed, bool flaky)
      : InterceptingHost(base), m_base(base), m_seed(seed), m_flaky(flaky) {}

  // The oddities of `build`, one in so many questions; 0: none.
  void StartBuild(std::uint32_t build, std::uint32_t oneIn, std::optional<Operation> failing) {
    m_build = build;
    m_oneIn = oneIn;
    m_failing = failing;
  }

  Status GetDeviceRegistryProperty(DeviceSetHandle set, const SP_DEVINFO_DATA& data, std::uint32_t property,
                                   std::uint32_t* type, void* buffer, std::uint32_t bytes,
                                   std::uint32_t* required) noexcept override {
    if (const Status failed = BeforeCall({Operation::GetDeviceRegistryProperty}); !failed) return failed;
    std::vector<std::uint8_t> value(8192);
    std::uint32_t ownType = 0, size = 0;
    Status status = m_base.GetDeviceRegistryProperty(set, data, property, &ownType, value.data(), 8192, &size);
    if (!status && status.error != kERROR_INVALID_DATA) return status;
    value.resize(size);
    status = OddProperty(Odd(1, data.DevInst, property), status, ownType, value);
    if (!status) return status;
    if (type) *type = ownType;
    if (required) *required = static_cast<std::uint32_t>(value.size());
    if (bytes < value.size()) return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
    std::copy(value.begin(), value.end(), static_cast<std::uint8_t*>(buffer));
    return Status::Success();
  }
  Status GetDevNodeRegistryProperty(DevInst node, std::uint32_t property, std::uint32_t* type, void* buffer,
                                    std::uint32_t& bytes) noexcept override {
    if (const Status failed = BeforeCall({Operation::GetDevNodeRegistryProperty}); !failed) return failed;
    std::vector<std::uint8_t> value(8192);
    std::uint32_t ownType = 0, size = 8192;
    Status status = m_base.GetDevNodeRegistryProperty(node, property, &ownType, value.data(), size);
    value.resize(status ? size : 0);
    status = OddProperty(Odd(2, node, property), status, ownType, value);
    if (!status) return Status::Failure(kCmFailure);
    if (type) *type = ownType;
    const bool fits = bytes >= value.size();
    bytes = static_cast<std::uint32_t>(value.size());
    if (!fits) return Status::Failure(kCR_BUFFER_SMALL);
    std::copy(value.begin(), value.end(), static_cast<std::uint8_t*>(buffer));
    return Status::Success();
  }
  Status GetDeviceInstanceId(DeviceSetHandle set, const SP_DEVINFO_DATA& data, char16_t* buffer, std::uint32_t chars,
                             std::uint32_t* required) noexcept override {
    if (const Status failed = BeforeCall({Operation::GetDeviceInstanceId}); !failed) return failed;
    std::u16string id(1024, u'\0');
    if (const Status status = m_base.GetDeviceInstanceId(set, data, id.data(), 1024, nullptr); !status) return status;
    id = std::u16string(UpToZero(id));
    if (!OddId(Odd(3, data.DevInst), id)) return Status::Failure(kGeneralFailure);
    if (required) *required = static_cast<std::uint32_t>(id.size() + 1);
    if (!buffer || chars <= id.size()) return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
    std::copy_n(id.c_str(), id.size() + 1, buffer);
    return Status::Success();
  }
  Status GetDeviceId(DevInst node, char16_t* buffer, std::uint32_t chars) noexcept override {
    if (const Status failed = BeforeCall({Operation::GetDeviceId}); !failed) return failed;
    std::u16string id(1024, u'\0');
    if (const Status status = m_base.GetDeviceId(node, id.data(), 1024); !status) return status;
    id = std::u16string(UpToZero(id));
    if (!OddId(Odd(4, node), id)) return Status::Failure(kCmFailure);
    if (chars <= id.size()) return Status::Failure(kCR_BUFFER_SMALL);
    std::copy_n(id.c_str(), id.size() + 1, buffer);
    return Status::Success();
  }
  Status GetParent(DevInst node, DevInst& parent) noexcept override {
    // Devices without parent end whole readings: seldom, and only where nothing hangs below.
    DevInst child = 0;
    if (!m_base.GetChild(node, child) && Odd(5, node) % 8 == 1) return Status::Failure(kCmFailure);
    return InterceptingHost::GetParent(node, parent);
  }
  Status GetClassDevs(const Guid* guid, std::uint32_t flags, DeviceSetHandle& set) noexcept override {
    const Status status = InterceptingHost::GetClassDevs(guid, flags, set);
    if (status && (flags & kDIGCF_PROFILE)) m_profileSets.insert(set);
    return status;
  }
  Status EnumDeviceInfo(DeviceSetHandle set, std::uint32_t index, SP_DEVINFO_DATA& data) noexcept override {
    if (const Status failed = BeforeCall({Operation::EnumDeviceInfo}); !failed) return failed;
    // A hardware profile lacks some devices.
    const bool profile = m_profileSets.contains(set);
    for (std::uint32_t at = 0;; ++at) {
      const Status status = m_base.EnumDeviceInfo(set, at, data);
      if (!status) return status;
      if (profile && Odd(6, data.DevInst) % 4 == 1) continue;
      if (index-- == 0) return Odd(7, data.DevInst) % 16 == 1 ? Status::Failure(kGeneralFailure) : status;
    }
  }
  Status GetDeviceInterfaceDetail(DeviceSetHandle set, const SP_DEVICE_INTERFACE_DATA& data, void* detail,
                                  std::uint32_t detailBytes, std::uint32_t* required,
                                  SP_DEVINFO_DATA* device) noexcept override {
    if (const Status failed = BeforeCall({Operation::GetDeviceInterfaceDetail}); !failed) return failed;
    const std::uint64_t odd = Odd(8, data.Reserved, data.InterfaceClassGuid.Data1);
    if (odd % 8 == 1) return Status::Failure(kGeneralFailure);
    if (odd % 8 != 2) return m_base.GetDeviceInterfaceDetail(set, data, detail, detailBytes, required, device);
    // A path that no device opens, and that needs more than any first buffer.
    if (detail == nullptr ? detailBytes != 0 : detailBytes < kInterfaceDetailSize)
      return Status::Failure(kERROR_INVALID_USER_BUFFER);
    const std::u16string path(600, u'p');
    const auto needed = static_cast<std::uint32_t>(kInterfaceDetailPathOffset + (path.size() + 1) * 2);
    if (required) *required = needed;
    std::uint32_t own = 0;
    m_base.GetDeviceInterfaceDetail(set, data, nullptr, 0, &own, device);
    if (detailBytes < needed) return Status::Failure(kERROR_INSUFFICIENT_BUFFER);
    std::memcpy(static_cast<std::uint8_t*>(detail) + kInterfaceDetailPathOffset, path.c_str(), needed - 4);
    return Status::Success();
  }
  Status GetClassImageIndex(DeviceSetHandle list, const Guid& guid, std::int32_t& index) noexcept override {
    if (Odd(9, guid.Data1) % 4 == 1) return Status::Failure(kGeneralFailure);
    return InterceptingHost::GetClassImageIndex(list, guid, index);
  }
  Status GetClassDescription(const Guid& guid, char16_t* buffer, std::uint32_t chars,
                             std::uint32_t* required) noexcept override {
    if (Odd(10, guid.Data1) % 4 == 1) return Status::Failure(kGeneralFailure);
    return InterceptingHost::GetClassDescription(guid, buffer, chars, required);
  }
  Status OpenDevice(const char16_t* path, std::uint32_t access, std::uint32_t share,
                    FileHandle& handle) noexcept override {
    if (Odd(11, HashText(path)) % 4 == 1) {
      handle = kInvalidHandle;
      return Status::Failure(kGeneralFailure);
    }
    const Status status = InterceptingHost::OpenDevice(path, access, share, handle);
    if (status) m_paths[handle] = HashText(path);
    return status;
  }
  Status DeviceControl(FileHandle handle, std::uint32_t code, const void* in, std::uint32_t inBytes, void* out,
                       std::uint32_t outBytes, std::uint32_t& returned) noexcept override {
    // The first four bytes of a question to a hub are the port.
    std::uint32_t port = 0;
    if (inBytes >= sizeof port) std::memcpy(&port, in, sizeof port);
    if (Odd(12, m_paths[handle] + port, code) % 4 == 1) {
      returned = 0;
      return Status::Failure(kGeneralFailure);
    }
    return InterceptingHost::DeviceControl(handle, code, in, inBytes, out, outBytes, returned);
  }
  std::uint32_t DriveType(const char16_t* path) noexcept override {
    const std::uint64_t odd = Odd(13, HashText(path));
    return odd ? static_cast<std::uint32_t>(odd % 7) : InterceptingHost::DriveType(path);
  }
  Status VolumePathNames(const char16_t* volume, char16_t* names, std::uint32_t chars,
                         std::uint32_t& required) noexcept override {
    if (Odd(14, HashText(volume))) return Status::Failure(kGeneralFailure);
    return InterceptingHost::VolumePathNames(volume, names, chars, required);
  }
  Status VolumeNameForMountPoint(const char16_t* path, char16_t* name, std::uint32_t chars) noexcept override {
    if (Odd(15, HashText(path))) return Status::Failure(kGeneralFailure);
    return InterceptingHost::VolumeNameForMountPoint(path, name, chars);
  }
  Status DosDeviceTarget(const char16_t* name, char16_t* target, std::uint32_t chars) noexcept override {
    if (Odd(16, HashText(name))) return Status::Failure(kGeneralFailure);
    return InterceptingHost::DosDeviceTarget(name, target, chars);
  }

 private:
  // 0 where the question is answered as it is; else what chooses the oddity. Half of them stay as long as the PC.
  std::uint64_t Odd(std::uint32_t kind, std::uint64_t what, std::uint64_t more = 0) const {
    if (m_oneIn == 0) return 0;
    std::uint64_t choice = Mix(Mix(Mix(m_seed, kind), what), more);
    if (choice % 2 == 0) choice = Mix(choice, m_build / 2);
    choice /= 2;
    return choice % m_oneIn == 0 ? choice / m_oneIn | 1u << 20 : 0;
  }

  Status OddProperty(std::uint64_t odd, Status status, std::uint32_t& type, std::vector<std::uint8_t>& value) const {
    if (odd == 0) return status;
    const auto text = [&](std::u16string_view units, bool zero = true) {
      type = kREG_SZ;
      value.resize((units.size() + zero) * 2);
      std::memset(value.data(), 0, value.size());
      std::memcpy(value.data(), units.data(), units.size() * 2);
      return Status::Success();
    };
    static constexpr std::u16string_view kNames[] = {u"usbhub", u"System", u"DiskDrive", u"USB", u"pROCESSOR", u"Net"};
    switch (odd % 24) {
      case 0:
      case 1:
      case 2:
        return Status::Failure(kERROR_INVALID_DATA);
      case 3:
        return Status::Failure(kGeneralFailure);
      case 4:
        return Status::Failure(0);
      case 5:
        return text(std::u16string(70, u'a'));
      case 6:
        return text(std::u16string(62, u'b'));
      case 7:
        return text(std::u16string(63, u'c'), false);
      case 8:
        return text(std::u16string(260, u'd'), false);
      case 9:
        return text(std::u16string(259, u'e'));
      case 10:
        return text(std::u16string(300, u'f'));
      case 11:
        return text(std::u16string(1200, u'g'));
      case 12:
        return text(std::u16string(199, u'h'));
      case 13:
        return text(std::u16string(200, u'i'), false);
      case 14:
        return text(u"");
      case 15:
        return text(u"", false);
      case 16:
        text(m_flaky ? u"\u6D6D\u6D6D\u6D6D" : u"odd");
        value.resize(3);
        return Status::Success();
      case 17:
        text(u"unended", false);
        return Status::Success();
      default:
        return text(kNames[odd / 24 % std::size(kNames)]);
    }
  }
  static bool OddId(std::uint64_t odd, std::u16string& id) {
    if (odd == 0) return true;
    switch (odd % 6) {
      case 0:
        return false;
      case 1:
        id += std::u16string(250, u'x');
        return true;
      case 2:
        id += std::u16string(600, u'y');
        return true;
      case 3:
        id = Replaced(id, u'\\', u'/');
        return true;
      case 4:
        id += u"\\";
        return true;
      default:
        id += u"/&0";
        return true;
    }
  }

  Status BeforeCall(const HostCall& call) noexcept override {
    if (IsReleasing(call.operation)) return Status::Success();
    const bool fails = m_flaky && m_build % 2 == 1 && Mix(Mix(m_seed, 17), ++m_calls) % 32 == 0;
    if (!fails && m_failing != call.operation) return Status::Success();
    return Status::Failure(IsConfigurationManager(call.operation) ? kCmFailure : kGeneralFailure);
  }

  Host& m_base;
  std::uint32_t m_seed, m_build = 0, m_oneIn = 0;
  bool m_flaky;
  std::uint64_t m_calls = 0;
  std::optional<Operation> m_failing;
  std::set<DeviceSetHandle> m_profileSets;
  std::map<FileHandle, std::uint64_t> m_paths;
};

class Digest {
 public:
  void Add(std::uint64_t number) { m_value = Mix(m_value, number); }
  template <class Nodes>
  void AddAll(const Nodes& nodes) {
    for (const auto& node : nodes) {
      std::u16string text;
      node->ToString(text, u"");
      Add(HashText(text));
    }
    Add(nodes.size());
  }
  void Add(const std::vector<DeviceNodeRecord>& level) {
    for (const DeviceNodeRecord& record : level) {
      Add(record.DevInst);
      Add(record.ParentDevInst);
      for (const auto* text : {&record.InstanceId, &record.ParentInstanceId, &record.Name, &record.ClassName,
                               &record.Location, &record.HardwareId})
        Add(HashText(*text));
      Add(record.Children);
    }
    Add(level.size());
  }
  void Add(const CZKUMUsbTreeBuilder& builder) {
    for (std::size_t kind = 0; kind <= kModifiedList; ++kind) AddAll(*builder.GetDeviceList(kind));
    if (builder.Root()) AddAll(std::vector<NodePtr>{builder.Root()});
    const InfoDeviceCache& devices = builder.DeviceInfo();
    for (const auto* set :
         {&devices.Current(), &devices.Added(), &devices.Removed(), &devices.Held(), &devices.Pending()})
      AddAll(*set);
    AddAll(builder.Storage().Volumes());
    AddAll(builder.Storage().Disks());
    Add(builder.Walker().m_deviceRecords);
  }
  std::uint64_t Value() const { return m_value; }

 private:
  std::uint64_t m_value = 1;
};

std::uint64_t DigestOf(std::uint32_t seed, bool flaky, std::size_t& open) {
  constexpr std::uint32_t kBuilds = 10;
  testing_support::RandomPc pc(seed);
  for (int i = 0; i < 8; ++i) pc.Change();
  OddHost host(pc.Pc(), seed, flaky);
  Digest digest;
  {
    CZKUMUsbTreeBuilder builder(host);
    for (std::uint32_t build = 0; build < kBuilds; ++build) {
      for (std::uint32_t changes = pc.Below(3); changes > 0; --changes) pc.Change();
      const std::uint64_t choice = Mix(Mix(seed, 99), build);
      std::optional<Operation> failing;
      if (choice % 6 == 0) failing = static_cast<Operation>(choice / 6 % wrappers::kOperations);
      static constexpr std::uint32_t kOneIn[] = {0, 0, 200, 40, 12};
      host.StartBuild(build, kOneIn[(seed + build / 3) % std::size(kOneIn)], failing);
      digest.Add(builder.Build());
      digest.Add(builder);
      if (choice / 512 % 4 != 0) builder.CommitDeviceCache();
    }
  }
  open = pc.Pc().OpenNames().size() + 1000 * pc.Pc().Misuses().size();
  digest.Add(open);
  return digest.Value();
}

}  // namespace

int main(int argc, char** argv) {
  const auto argument = [&](int place, unsigned long otherwise) {
    return static_cast<std::uint32_t>(argc > place ? std::strtoul(argv[place], nullptr, 10) : otherwise);
  };
  const std::uint32_t first = argument(1, 1), count = argument(2, 2000);
  for (std::uint32_t seed = first; seed < first + count; ++seed) {
    std::size_t open = 0;
    const std::uint64_t digest = DigestOf(seed, argc > 3, open);
    std::cout << seed << ' ' << std::hex << digest << std::dec << ' ' << open << '\n';
  }
}
