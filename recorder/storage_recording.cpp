// What disks, volumes and drives answer; volumes, mount points and drive letters.
#include <algorithm>
#include <array>
#include <cstring>

#include "platform/setup_api.h"
#include "platform/storage_ioctl.h"
#include "recorder/recording.h"
#include "records/device_set.h"

namespace recorder {
namespace {

using platform::simulated::Drive;
using platform::simulated::Storage;
using platform::simulated::Volume;

constexpr std::uint32_t kDescriptorBytes = 1024;
constexpr std::uint32_t kNameChars = 512;
constexpr std::uint32_t kPathNamesChars = 7800;

using NameBuffer = std::array<char16_t, kNameChars>;

Text TextOf(const NameBuffer& buffer) {
  const std::u16string_view text = platform::UpToZero({buffer.data(), buffer.size()});
  return text.size() < buffer.size() ? Text(text) : Text();
}

std::vector<Text> DriveRoots(platform::VolumeManager& volumes) {
  std::vector<char16_t> buffer(kNameChars);
  const auto size = static_cast<std::uint32_t>(buffer.size());
  const std::uint32_t written = volumes.LogicalDriveStrings(size, buffer.data());
  return written < size ? SplitTexts({buffer.data(), written}) : std::vector<Text>();
}

class StorageReader {
 public:
  StorageReader(platform::DeviceIo& io, platform::FileHandle file) : m_io(io), m_file(file) {}

  bool Read(Storage& storage) {
    const bool described = ReadDescriptor(storage);
    const bool numbered = ReadNumber(storage);
    return ReadMediaSerial(storage) || described || numbered;
  }

 private:
  bool ReadDescriptor(Storage& storage) {
    const platform::STORAGE_PROPERTY_QUERY query{};
    std::array<std::uint8_t, kDescriptorBytes> answer{};
    std::uint32_t received = 0;
    if (!m_io.DeviceControl(m_file, platform::kIOCTL_STORAGE_QUERY_PROPERTY, &query, sizeof query,
                            answer.data(), kDescriptorBytes, received)) {
      return false;
    }
    platform::STORAGE_DEVICE_DESCRIPTOR head{};
    received = std::min(received, kDescriptorBytes);
    std::memcpy(&head, answer.data(), std::min<std::size_t>(sizeof head, received));
    const auto text = [&](std::uint32_t offset) -> std::optional<std::string> {
      if (offset == 0 || offset >= received) return std::nullopt;
      const auto* begin = reinterpret_cast<const char*>(answer.data()) + offset;
      return std::string(begin, std::find(begin, begin + (received - offset), '\0'));
    };
    storage.deviceType = head.DeviceType;
    storage.deviceTypeModifier = head.DeviceTypeModifier;
    storage.removable = head.RemovableMedia != 0;
    storage.vendor = text(head.VendorIdOffset);
    storage.product = text(head.ProductIdOffset);
    storage.revision = text(head.ProductRevisionOffset);
    storage.serial = text(head.SerialNumberOffset);
    return true;
  }

  bool ReadNumber(Storage& storage) {
    platform::STORAGE_DEVICE_NUMBER number{};
    std::uint32_t received = 0;
    if (!m_io.DeviceControl(m_file, platform::kIOCTL_STORAGE_GET_DEVICE_NUMBER, nullptr, 0, &number,
                            sizeof number, received) ||
        received < sizeof number) {
      return false;
    }
    storage.deviceNumber = {number.DeviceType, number.DeviceNumber, number.PartitionNumber};
    return true;
  }

  // The component asks for four bytes and looks only at the outcome.
  bool ReadMediaSerial(Storage& storage) {
    constexpr std::size_t kTextAt = 16 / sizeof(char16_t);
    std::array<char16_t, 400> answer{};
    std::uint32_t received = 0;
    const auto ask = [&](std::uint32_t bytes) {
      return m_io
          .DeviceControl(m_file, platform::kIOCTL_STORAGE_GET_MEDIA_SERIAL_NUMBER, nullptr, 0,
                         answer.data(), bytes, received)
          .ok;
    };
    if (!ask(4)) return false;
    storage.mediaSerialNumber.emplace();
    if (ask(sizeof answer)) {
      const std::size_t end = std::min<std::size_t>(received / sizeof(char16_t), answer.size());
      if (end > kTextAt) {
        *storage.mediaSerialNumber = platform::UpToZero({answer.data() + kTextAt, end - kTextAt});
      }
    }
    return true;
  }

  platform::DeviceIo& m_io;
  platform::FileHandle m_file;
};

class VolumeRecorder {
 public:
  explicit VolumeRecorder(Recording& recording) : m_recording(recording), m_host(recording.host) {}

  void Run() {
    RecordNames();
    for (std::size_t i = 0; i < m_volumes.size(); ++i) Complete(m_volumes[i]);
    m_recording.machine.volumes = std::move(m_volumes);
    for (const Text& root : DriveRoots(m_host)) RecordDrive(root);
  }

 private:
  void Add(const Text& name, const Text& device) {
    const Text lowered = platform::ToLower(name);
    if (!lowered.starts_with(u"\\\\?\\volume{") || !lowered.ends_with(u"}\\")) {
      m_recording.Note(u"A volume is left out: its name is " + name);
      return;
    }
    const auto [known, fresh] = m_positions.try_emplace(lowered, m_volumes.size());
    if (fresh) m_volumes.push_back({name, {}, {}, {}, platform::kDRIVE_FIXED, false, {}});
    if (m_volumes[known->second].device.empty()) m_volumes[known->second].device = device;
  }

  void RecordNames() {
    KelvoUHW::VolumeSearch search(m_host);
    NameBuffer name{};
    for (platform::Status found = search.First(name.data(), kNameChars);
         found && m_volumes.size() < kMostElements; found = search.Next(name.data(), kNameChars)) {
      Add(TextOf(name), {});
    }
    for (const auto& entry : m_recording.machine.interfaces) {
      if (entry.interfaceClass != platform::GUID_DEVINTERFACE_VOLUME) continue;
      name.fill(u'\0');
      if (m_host.VolumeNameForMountPoint((entry.path + u"\\").c_str(), name.data(), kNameChars)) {
        Add(TextOf(name), entry.device);
      }
    }
  }

  void Complete(Volume& volume) {
    RecordPaths(volume);
    // The component asks for the type of a folder where it could ask for that of the volume.
    const auto folder = std::find_if(volume.paths.begin(), volume.paths.end(),
                                     [](const Text& path) { return path.size() > 3; });
    volume.driveType =
        std::min(m_host.DriveType((folder != volume.paths.end() ? *folder : volume.name).c_str()),
                 platform::kDRIVE_RAMDISK);
    std::uint32_t serial = 0;
    std::uint32_t flags = 0;
    if (m_host.VolumeInformation(volume.name.c_str(), nullptr, 0, serial, flags, nullptr, 0)) {
      volume.serial = serial;
      volume.reparsePoints = (flags & platform::kFILE_SUPPORTS_REPARSE_POINTS) != 0;
    }
    if (volume.reparsePoints) RecordFolders(volume);
  }

  void RecordPaths(Volume& volume) {
    std::vector<char16_t> names(kPathNamesChars);
    for (int reads = 0; reads < kMostReads; ++reads) {
      const auto size = static_cast<std::uint32_t>(names.size());
      std::uint32_t required = 0;
      if (m_host.VolumePathNames(volume.name.c_str(), names.data(), size, required)) {
        for (Text& path : SplitTexts({names.data(), std::min(required, size)})) {
          if (path.ends_with(u'\\') && m_paths.Add(path)) volume.paths.push_back(std::move(path));
        }
        return;
      }
      if (required <= size || required > kMostBytes) return;
      names.resize(required);
    }
  }

  void RecordFolders(Volume& volume) {
    KelvoUHW::MountPointSearch search(m_host);
    NameBuffer folder{};
    for (platform::Status found = search.First(volume.name, folder.data(), kNameChars);
         found && volume.folderMounts.size() < kMostElements;
         found = search.Next(folder.data(), kNameChars)) {
      const Text path = TextOf(folder);
      const Text around = volume.paths.empty() ? volume.name : volume.paths.front();
      NameBuffer mounted{};
      if (path.ends_with(u'\\') && path.front() != u'\\' && path.find(u':') == Text::npos &&
          m_host.VolumeNameForMountPoint((around + path).c_str(), mounted.data(), kNameChars)) {
        volume.folderMounts.push_back({path, TextOf(mounted)});
      }
      folder.fill(u'\0');
    }
  }

  void RecordDrive(const Text& root) {
    if (root.size() != 3 || root[0] < u'A' || root[0] > u'Z') return;
    Drive drive{
        root[0], std::min(m_host.DriveType(root.c_str()), platform::kDRIVE_RAMDISK), {}, {}};
    NameBuffer target{};
    if (m_host.DosDeviceTarget(root.substr(0, 2).c_str(), target.data(), kNameChars)) {
      drive.dosDevice = TextOf(target);
      drive.device = OwnerOf(drive);
    }
    m_recording.machine.drives.push_back(std::move(drive));
  }

  // The device with which the letter goes: the one that the letter stands for, else the disk.
  Text OwnerOf(const Drive& drive) const {
    const auto& machine = m_recording.machine;
    for (const auto& device : machine.devices) {
      const auto& name = device.physicalName;
      if (name && platform::EqualIgnoringCase(*name, *drive.dosDevice)) return device.id;
    }
    const auto number = NumberOf(u"\\\\.\\" + Text(1, drive.letter) + u":");
    if (!number) return {};
    for (const auto& entry : machine.interfaces) {
      const bool isVolume = entry.interfaceClass == platform::GUID_DEVINTERFACE_VOLUME;
      const auto other = isVolume ? std::nullopt : NumberOf(entry.path);
      if (other && other->type == number->type && other->number == number->number) {
        return entry.device;
      }
    }
    return {};
  }

  std::optional<platform::simulated::DeviceNumber> NumberOf(const Text& path) const {
    for (const Storage& storage : m_recording.machine.storage) {
      if (platform::EqualIgnoringCase(storage.path, path)) return storage.deviceNumber;
    }
    return std::nullopt;
  }

  Recording& m_recording;
  platform::Host& m_host;
  std::vector<Volume> m_volumes;
  std::unordered_map<Text, std::size_t> m_positions;  // by lowered name
  platform::simulated::NameSet m_paths;
};

}  // namespace

void RecordStorage(Recording& recording) {
  const auto record = [&recording](const Text& path) {
    KelvoUHW::DeviceFile file(recording.host);
    if (!file.Open(path, 0, platform::kFILE_SHARE_READ | platform::kFILE_SHARE_WRITE)) return;
    Storage storage;
    storage.path = path;
    if (StorageReader(recording.host, file.Get()).Read(storage)) {
      recording.machine.storage.push_back(std::move(storage));
    }
  };
  for (const auto& entry : recording.machine.interfaces) {
    for (const platform::Guid& asked :
         {platform::GUID_DEVINTERFACE_VOLUME, platform::GUID_DEVINTERFACE_DISK,
          platform::GUID_DEVINTERFACE_FLOPPY, platform::GUID_DEVINTERFACE_CDROM}) {
      if (entry.interfaceClass == asked) record(entry.path);
    }
  }
  for (char16_t letter = u'A'; letter <= u'Z'; ++letter) {
    record(u"\\\\.\\" + Text(1, letter) + u":");
  }
}

void RecordVolumes(Recording& recording) { VolumeRecorder(recording).Run(); }

}  // namespace recorder
