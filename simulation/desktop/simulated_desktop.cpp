#include "simulation/desktop/simulated_desktop.h"

#include <algorithm>
#include <array>
#include <iterator>
#include <string_view>
#include <utility>

#include "simulation/desktop/desktop_state.h"

namespace platform::simulated {
namespace {

struct SystemText {
  std::uint32_t code;
  std::u16string_view text;
};
constexpr std::array kSystemTexts = {
    SystemText{kERROR_ACCESS_DENIED, u"Access is denied.\r\n"},
    SystemText{8, u"Not enough memory resources are available to process this command.\r\n"},
    SystemText{kERROR_INVALID_WINDOW_HANDLE, u"Invalid window handle.\r\n"},
    SystemText{kERROR_CANNOT_FIND_WND_CLASS, u"Cannot find window class.\r\n"},
    SystemText{kERROR_CLASS_ALREADY_EXISTS, u"Class already exists.\r\n"},
};

std::optional<std::u16string> TextOrNothing(const char16_t* text) {
  return text != nullptr ? std::optional<std::u16string>(text) : std::nullopt;
}

}  // namespace

SimulatedDesktop::SimulatedDesktop(ClockMode mode) : m_state(std::make_unique<State>(mode)) {
  const auto lock = m_state->Guard();
  if (mode == ClockMode::Virtual) m_state->scheduler.Count();
}

SimulatedDesktop::~SimulatedDesktop() {
  EndProcess();
  for (char16_t* buffer : m_state->localBuffers) delete[] buffer;
}

ClockMode SimulatedDesktop::Mode() const noexcept { return m_state->scheduler.Mode(); }

std::uint64_t SimulatedDesktop::Now() const {
  const auto lock = m_state->Guard();
  return m_state->scheduler.Now();
}

void SimulatedDesktop::SetDefaultProcedure(std::function<LResult(const MSG&)> procedure) {
  const auto lock = m_state->Guard();
  m_state->defaultProcedure = std::move(procedure);
}

void SimulatedDesktop::SetChoice(Scheduler::Choose choose) {
  const auto lock = m_state->Guard();
  m_state->scheduler.SetChoice(std::move(choose));
}

void SimulatedDesktop::Order(const CallOrder& order) {
  const auto lock = m_state->Guard();
  m_state->orders.Add(order);
}

std::uint64_t SimulatedDesktop::Calls(DesktopCall call) const {
  const auto lock = m_state->Guard();
  return m_state->orders.Count(call);
}

DesktopCounts SimulatedDesktop::Counts() const {
  const auto lock = m_state->Guard();
  return {m_state->scheduler.Started(), m_state->classes.size(), m_state->windows.size(),
          m_state->registrations.size(), m_state->localBuffers.size()};
}

std::vector<WindowFacts> SimulatedDesktop::Windows() const {
  const auto lock = m_state->Guard();
  std::vector<WindowFacts> facts;
  for (const auto& [handle, window] : m_state->windows) facts.push_back(window.facts);
  return facts;
}

std::vector<ClassFacts> SimulatedDesktop::Classes() const {
  const auto lock = m_state->Guard();
  return m_state->classes;
}

std::vector<RegistrationFacts> SimulatedDesktop::Registrations() const {
  const auto lock = m_state->Guard();
  std::vector<RegistrationFacts> facts;
  for (const auto& [handle, registration] : m_state->registrations) facts.push_back(registration);
  return facts;
}

std::vector<SleepFacts> SimulatedDesktop::Sleeps() const {
  const auto lock = m_state->Guard();
  return m_state->sleeps;
}

std::vector<const void*> SimulatedDesktop::Pins() const {
  const auto lock = m_state->Guard();
  return m_state->pins;
}

std::vector<BoxFacts> SimulatedDesktop::Boxes() const {
  const auto lock = m_state->Guard();
  return m_state->boxes;
}

std::optional<ExitFacts> SimulatedDesktop::Exit() const {
  const auto lock = m_state->Guard();
  return m_state->exit;
}

std::vector<std::u16string> SimulatedDesktop::Misuses() const {
  const auto lock = m_state->Guard();
  return m_state->misuses;
}

InstanceHandle SimulatedDesktop::GetModuleHandleW(const char16_t* name) noexcept {
  auto lock = m_state->Guard();
  if (!m_state->Begin(lock, DesktopCall::GetModuleHandleW)) return 0;
  return name == nullptr ? kProgramInstance : 0;
}

// The number makes the handle, so that a test sees which cursor a class has.
GraphicsHandle SimulatedDesktop::LoadCursorW(InstanceHandle instance,
                                             std::uint16_t number) noexcept {
  auto lock = m_state->Guard();
  if (!m_state->Begin(lock, DesktopCall::LoadCursorW)) return 0;
  return instance == 0 && number >= kIDC_ARROW ? 0x10000 + number : 0;
}

GraphicsHandle SimulatedDesktop::GetStockObject(std::int32_t object) noexcept {
  auto lock = m_state->Guard();
  if (!m_state->Begin(lock, DesktopCall::GetStockObject)) return 0;
  return object >= 0 ? 0x20000 + object : 0;
}

std::uint32_t SimulatedDesktop::FormatMessageW(std::uint32_t flags, std::uint32_t code,
                                               std::uint32_t language, char16_t*& text) noexcept {
  auto lock = m_state->Guard();
  if (!m_state->Begin(lock, DesktopCall::FormatMessageW)) return 0;
  if (flags != (kFORMAT_MESSAGE_ALLOCATE_BUFFER | kFORMAT_MESSAGE_FROM_SYSTEM) ||
      language != kLANG_USER_DEFAULT) {
    return 0;
  }
  const auto known = std::find_if(kSystemTexts.begin(), kSystemTexts.end(),
                                  [&](const SystemText& entry) { return entry.code == code; });
  if (known == kSystemTexts.end()) return 0;
  // The system's allocation: the caller gives it back with LocalFree.
  text = new (std::nothrow) char16_t[known->text.size() + 1]{};
  if (text == nullptr) return 0;
  std::copy(known->text.begin(), known->text.end(), text);
  m_state->localBuffers.insert(text);
  return static_cast<std::uint32_t>(known->text.size());
}

void SimulatedDesktop::LocalFree(char16_t* text) noexcept {
  const auto lock = m_state->Guard();
  if (m_state->localBuffers.erase(text) != 0) {
    delete[] text;
  } else if (text != nullptr) {
    m_state->misuses.emplace_back(u"release of a buffer that is not allocated");
  }
}

std::int32_t SimulatedDesktop::MessageBoxW(WindowHandle owner, const char16_t* text,
                                           const char16_t* caption, std::uint32_t type) noexcept {
  const auto lock = m_state->Guard();
  m_state->boxes.push_back({owner, TextOrNothing(text), TextOrNothing(caption), type});
  return 1;  // IDOK
}

}  // namespace platform::simulated
