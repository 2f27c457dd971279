#include "simulation/pc/simulated_pc.h"

#include <utility>
#include <variant>

#include "simulation/machine/steps.h"
#include "simulation/pc/state.h"

namespace platform::simulated {
namespace {

bool IsThere(const MachineIndex& index, const OpenFile& file) {
  switch (file.kind) {
    case FileKind::Controller:
      return index.Controller(file.key) != MachineIndex::kNone;
    case FileKind::Hub:
      return index.Hub(file.key) != MachineIndex::kNone;
    case FileKind::Interface:
      return index.Interface(file.key) != MachineIndex::kNone;
    case FileKind::Drive:
      return index.Drive(file.key[4]) != MachineIndex::kNone;
  }
  return false;
}

}  // namespace

SimulatedPc::SimulatedPc(Machine machine) : m_state(std::make_unique<State>(std::move(machine))) {}

SimulatedPc::~SimulatedPc() = default;

std::u16string SimulatedPc::Apply(const Step& step) {
  const std::lock_guard lock(m_state->mutex);
  if (std::holds_alternative<std::monostate>(step.change)) return {};
  Machine next = m_state->now->machine;
  Text reason = std::visit([&](const auto& change) { return CarryOut(next, change); }, step.change);
  if (!reason.empty()) return reason;
  m_state->now = std::make_unique<const IndexedMachine>(std::move(next), m_state->numbers);
  m_state->handles.ForEachFile([&](OpenFile& file) {
    if (!IsThere(m_state->now->index, file)) file.gone = true;
  });
  return {};
}

Machine SimulatedPc::Snapshot() const {
  const std::lock_guard lock(m_state->mutex);
  return m_state->now->machine;
}

OpenCounts SimulatedPc::Open() const {
  const std::lock_guard lock(m_state->mutex);
  return m_state->handles.Counts();
}

std::vector<std::u16string> SimulatedPc::OpenNames() const {
  const std::lock_guard lock(m_state->mutex);
  return m_state->handles.OpenNames();
}

std::vector<std::u16string> SimulatedPc::Misuses() const {
  const std::lock_guard lock(m_state->mutex);
  return m_state->handles.Misuses();
}

std::u16string SimulatedPc::DebugText() const {
  const std::lock_guard lock(m_state->mutex);
  return m_state->debugText;
}

void SimulatedPc::WriteDebugText(const char16_t* text) noexcept {
  if (text == nullptr) return;
  const std::lock_guard lock(m_state->mutex);
  m_state->debugText += text;
}

}  // namespace platform::simulated
