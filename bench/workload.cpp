#include "bench/workload.h"

#include <algorithm>
#include <stdexcept>
#include <variant>

#include "platform/text.h"
#include "records/device_set.h"
#include "records/records.h"

namespace bench {

using platform::simulated::GeneratedShape;

const char* NameOf(Work work) noexcept {
  static constexpr const char* kNames[] = {"walk", "first", "unchanged", "one_more"};
  return kNames[static_cast<std::size_t>(work)];
}

const char* NameOf(GeneratedShape shape) noexcept {
  return shape == GeneratedShape::Wide ? "wide" : "deep";
}

Workload::Workload(Work work, std::size_t devices, platform::simulated::SimulatedPc& pc,
                   platform::Host& host)
    : m_work(work), m_devices(devices), m_pc(pc), m_host(host) {
  if (work == Work::OneMore) m_oneMore = PlugOneMoreStick(pc.Snapshot());
}

void Workload::Prepare() {
  switch (m_work) {
    case Work::Walk:
      m_walker.emplace(m_host);
      return;
    case Work::First:
      m_builder.emplace(m_host);
      return;
    case Work::Unchanged:
    case Work::OneMore:
      break;
  }
  if (!m_builder) m_builder.emplace(m_host);
  if (m_plugged) {
    const auto& stick = std::get<platform::simulated::Plug>(m_oneMore.change).fragment.devices[0];
    Expect(m_pc.Apply({0, {}, platform::simulated::Unplug{stick.id}}).empty());
    m_plugged = false;
  }
  BuildUntilQuiet();
  if (m_work == Work::OneMore) {
    Expect(m_pc.Apply(m_oneMore).empty());
    m_plugged = true;
  }
}

void Workload::Run() {
  switch (m_work) {
    case Work::Walk:
      Expect(WalkOnce() >= m_devices);
      return;
    case Work::First:
      Expect(m_builder->Build() && m_builder->Walker().m_nConnectedDevices >= m_devices);
      return;
    case Work::Unchanged:
      Expect(!m_builder->Build());
      return;
    case Work::OneMore:
      Expect(m_builder->Build() && m_builder->GetDeviceList(KelvoUHW::kAttachedList)->size() == 1);
      return;
  }
}

void Workload::BuildUntilQuiet() {
  constexpr int kMostBuilds = 5;
  int builds = 0;
  while (m_builder->Build()) {
    m_builder->CommitDeviceCache();
    Expect(++builds < kMostBuilds);
  }
  m_builder->CommitDeviceCache();
}

void Workload::Expect(bool asExpected) const {
  if (!asExpected) throw std::logic_error(std::string(NameOf(m_work)) + ": not as expected");
}

// The steps of a walk without its last one, which reads the device manager.
std::uint32_t Workload::WalkOnce() {
  m_walker->m_building = KelvoUHW::MakeRecord<KelvoUHW::CZKUMUsbTreeRootImpl>();
  for (std::int32_t number = 0; number < 10; ++number) {
    const std::u16string name = u"\\\\.\\HCD" + platform::Decimal(number);
    KelvoUHW::DeviceFile file(m_host);
    if (file.Open(name, platform::kGENERIC_WRITE, platform::kFILE_SHARE_WRITE)) {
      m_walker->AddHostController(file.Get(), name);
    }
  }
  return m_walker->m_nConnectedDevices;
}

}  // namespace bench
