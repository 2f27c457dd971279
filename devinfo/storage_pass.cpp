#include "devinfo/storage_pass.h"

#include <algorithm>
#include <array>
#include <string_view>

#include "records/devnode.h"
#include "records/received_text.h"

namespace KelvoUHW {
namespace {

constexpr std::uint32_t kVolumeNameChars = 512;

// Case counts, in both tests.
bool BelongsToUsbLikeDevice(const NodeIdentity& node) {
  constexpr std::array<std::u16string_view, 5> kParentPrefixes{u"USB", u"IUSB", u"SD", u"PCI",
                                                               u"SCSI"};
  return std::any_of(kParentPrefixes.begin(), kParentPrefixes.end(),
                     [&](std::u16string_view prefix) {
                       return node.m_strDevInstIdParent.starts_with(prefix);
                     }) ||
         node.m_strDevInstId.find(u"USB") != std::u16string::npos;
}

}  // namespace

StorageOutcome StoragePass::Identify(CZKUMInterfaceDeviceImpl& record) {
  record.m_devInstHandle = record.DeviceData.DevInst;
  record.SetInstanceId(GetDeviceId(m_nodes, record.m_devInstHandle));
  ResolveParentInstanceId(m_nodes, record);
  return BelongsToUsbLikeDevice(record) ? KStorageAccepted : KStorageRejected;
}

StorageOutcome StoragePass::PrepareVolumeRecord(CZKUMInterfaceDeviceImpl& record) {
  const StorageOutcome outcome = Identify(record);
  if (outcome != KStorageAccepted) return outcome;

  std::array<char16_t, kVolumeNameChars> name{};
  const std::u16string mountPoint = record.DevicePath() + u"\\";
  if (!m_host.VolumeNameForMountPoint(mountPoint.c_str(), name.data(), kVolumeNameChars)) {
    return KStorageAccepted;
  }
  if (auto volumeName = ReceivedText(name)) {
    record.VolumeName = *std::move(volumeName);
    m_mountPoints.FindMountPoints(record.VolumeName, record.MountPoints);
  }
  return KStorageAccepted;
}

StorageOutcome StoragePass::OpenAndQueryVolume(CZKUMInterfaceDeviceImpl& record) {
  const StorageOutcome prepared = PrepareVolumeRecord(record);
  if (prepared != KStorageAccepted) return prepared;

  record.DeviceHandle.emplace(m_host);
  const platform::Status opened = record.DeviceHandle->Open(
      record.DevicePath(), 0, platform::kFILE_SHARE_READ | platform::kFILE_SHARE_WRITE);
  if (!opened) {
    record.DeviceHandle.reset();
    return KStorageCannotOpen;
  }
  m_diagnostics += u"++++++++++++++++++++++++++++++++++++++++++++++\r\n";
  const StorageOutcome outcome = QueryStorageProperties(m_host, m_host, record, m_diagnostics);
  record.DeviceHandle.reset();
  return outcome;
}

StorageOutcome StoragePass::PrepareDiskRecord(CZKUMInterfaceDeviceImpl& record) {
  const StorageOutcome outcome = Identify(record);
  if (outcome == KStorageAccepted) m_letters.FindDriveLettersForDisk(record, record.MountPoints);
  return outcome;
}

bool StoragePass::KeepsDisk(CZKUMInterfaceDeviceImpl& record) {
  record.DeviceHandle.reset();
  // Deliberate: a disk is kept when its query does not succeed. The handle was just closed, so the
  // query always fails: every disk is kept, without descriptor, and leaves a line of diagnostics.
  return QueryStorageProperties(m_host, m_host, record, m_diagnostics) != KStorageAccepted;
}

}  // namespace KelvoUHW
