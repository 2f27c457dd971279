#include <array>
#include <chrono>
#include <filesystem>
#include <optional>
#include <stdexcept>

#include "module/type_library.h"
#include "platform/console.h"
#include "platform/registry_key.h"
#include "platform/server_module.h"
#include "platform/system.h"
#include "platform/text.h"
#include "platform/windows/server_classes.h"
#include "simulation/machine/built_in_machine.h"
#include "simulation/machine/machine_file.h"
#include "tools/zkusb/component.h"
#include "tools/zkusb/pc.h"

namespace zkusb {

namespace {

using Clock = std::chrono::steady_clock;

constexpr std::uint32_t kAnswerMilliseconds = 500;
// The longest wait between a message and what it sets off is three seconds.
constexpr std::uint32_t kSettleMilliseconds = 4000;

// The file that looks at a simulated PC. The one that looks at this PC takes no machine file.
std::u16string SimulatedServer(const std::u16string& server) {
  std::u16string path = server.substr(0, server.find_last_of(u"\\/") + 1);
  path.append(u"ZKUsbMonitorSimulated.dll");
  if (!std::filesystem::exists(std::filesystem::path(path))) {
    throw std::runtime_error(
        "--machine and --script need ZKUsbMonitorSimulated.dll beside the program, and it is not "
        "there");
  }
  return path;
}

// A key, the values of it that registering writes, and all below it.
void AddLines(platform::Registry& registry, const std::u16string& path,
              std::vector<std::u16string>& lines) {
  platform::RegistryKey key(registry);
  if (!key.Open(platform::kHKEY_CLASSES_ROOT, path.c_str())) return;
  const std::u16string full = u"HKEY_CLASSES_ROOT\\" + path;
  lines.push_back(full);
  for (const char16_t* name : {u"", u"AppID", u"ThreadingModel", u"Version"}) {
    std::u16string text;
    if (!key.Text(name, text)) continue;
    std::u16string line = full;
    line.append(u"  ").append(*name ? name : u"(default)").append(u" = \"").append(text);
    lines.push_back(line.append(u"\""));
  }
  std::array<char16_t, platform::kMaxKeyNameChars + 1> name{};
  for (std::uint32_t index = 0;; ++index) {
    auto chars = static_cast<std::uint32_t>(name.size());
    if (!registry.EnumKey(key.Handle(), index, name.data(), chars)) return;
    AddLines(registry, std::u16string(path).append(u"\\").append(name.data(), chars), lines);
  }
}

}  // namespace

struct Pc::State {
  State(const std::string& machineFile, const std::string& scriptFile)
      : modulePath(platform::ServerModulePath()), scripted(!scriptFile.empty()) {
    if (machineFile.empty() && scriptFile.empty()) return;
    modulePath = SimulatedServer(modulePath);
    platform::windows::SetEnvironmentText(u"ZKUSB_MACHINE", platform::FromUtf8(machineFile));
    platform::windows::SetEnvironmentText(u"ZKUSB_SCRIPT", platform::FromUtf8(scriptFile));
  }

  std::u16string modulePath;
  const bool scripted;
  const Clock::time_point start = Clock::now();
  const Apartment apartment;
  std::optional<platform::windows::ServerClasses> classes;
};

Pc::Pc(const std::string& machineFile, const std::string& scriptFile)
    : m_state(std::make_unique<State>(machineFile, scriptFile)) {
  if (!machineFile.empty() || !scriptFile.empty()) {
    // Read here as well: what is wrong with them is said before anything starts.
    const platform::simulated::Machine machine =
        machineFile.empty()
            ? platform::simulated::ParseMachine(platform::simulated::BuiltInMachine(),
                                                platform::simulated::kBuiltInMachineName)
            : platform::simulated::LoadMachine(machineFile);
    if (!scriptFile.empty()) {
      for (const auto& step : platform::simulated::LoadScript(scriptFile, machine)) {
        m_steps.push_back({step.atMilliseconds, step.name});
      }
    }
  }
  m_state->classes.emplace(m_state->modulePath,
                           std::array{CLSID_ZKUMUsbTree, CLSID_ZKUMEventNotifier});
}

Pc::~Pc() = default;

void Pc::ApplyAll() {
  if (m_state->scripted) {
    throw std::runtime_error("--script: scripts play in real time here, for watch alone");
  }
}

void Pc::Play(std::size_t step) {
  const std::uint64_t at = m_steps.at(step).atMilliseconds;
  const std::uint64_t now = Now();
  if (at > now) WaitFor(static_cast<std::uint32_t>(at - now));
  WaitFor(kAnswerMilliseconds);
}

void Pc::WaitFor(std::uint32_t milliseconds) { platform::WaitForInterrupt(milliseconds); }

void Pc::Settle() {
  if (m_state->scripted) WaitFor(kSettleMilliseconds);
}

std::uint64_t Pc::Now() const {
  return static_cast<std::uint64_t>(
      std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - m_state->start).count());
}

std::vector<std::u16string> Pc::RegistryLines() const {
  platform::Registry& registry = *platform::CurrentSystem().registry;
  std::vector<std::u16string> lines;
  for (const char16_t* path : {
           u"AppID\\{A0C53575-7F3D-4FF2-B5A7-BFA873492510}",
           u"AppID\\ZKUsbMonitor.DLL",
           u"CLSID\\{1D7E7A5B-648D-4236-8604-8F5F3C82433A}",
           u"CLSID\\{34349D2D-14C6-414B-9771-A7BD2A7C7180}",
           u"KelvoUsbMonitor.EventNotifier",
           u"KelvoUsbMonitor.EventNotifier.1",
           u"KelvoUsbMonitor.UsbTree",
           u"KelvoUsbMonitor.UsbTree.1",
           u"TypeLib\\{A2AC77FD-36C6-4C2A-B238-F89B35DAA570}",
       }) {
    AddLines(registry, path, lines);
  }
  for (const auto& entry : KelvoUHW::ModuleTypeLibrary().interfaces) {
    AddLines(registry, u"Interface\\" + platform::GuidText(entry.iid), lines);
  }
  return lines;
}

void Pc::Register() {
  Check(platform::RegisterServerModule(m_state->modulePath), "registering the component");
}

void Pc::Unregister() {
  Check(platform::UnregisterServerModule(m_state->modulePath), "unregistering the component");
}

}  // namespace zkusb
