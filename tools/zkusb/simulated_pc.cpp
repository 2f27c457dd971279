#include <stdexcept>
#include <utility>

#include "module/type_library.h"
#include "platform/server_module.h"
#include "platform/system.h"
#include "platform/text.h"
#include "simulation/desktop/play_on_desktop.h"
#include "simulation/desktop/simulated_desktop.h"
#include "simulation/machine/built_in_machine.h"
#include "simulation/machine/machine_file.h"
#include "simulation/pc/simulated_pc.h"
#include "simulation/process/module_environment.h"
#include "simulation/process/registry.h"
#include "simulation/process/type_libraries.h"
#include "tools/zkusb/component.h"
#include "tools/zkusb/pc.h"

namespace zkusb {

namespace {

using platform::simulated::Machine;
using platform::simulated::MachineFileError;
using platform::simulated::Script;

Machine ReadMachine(const std::string& file) {
  return file.empty() ? platform::simulated::ParseMachine(platform::simulated::BuiltInMachine(),
                                                          platform::simulated::kBuiltInMachineName)
                      : platform::simulated::LoadMachine(file);
}

Script ReadScript(const std::string& file, const Machine& machine) {
  return file.empty() ? Script() : platform::simulated::LoadScript(file, machine);
}

}  // namespace

struct Pc::State {
  State(const std::string& scriptName, Script steps, Machine machine)
      : scriptFile(scriptName),
        script(std::move(steps)),
        modulePath(platform::ServerModulePath()),
        pc(std::move(machine)),
        typeLibraries(registry),
        environment(modulePath) {
    typeLibraries.Add(modulePath, KelvoUHW::ModuleTypeLibrary());
    platform::SetCurrentSystem({&pc, &desktop, &desktop, &registry, &typeLibraries, &environment});
    Register();
  }
  ~State() {
    // The process ends with the PC: its threads are gone before what they use is.
    desktop.EndProcess();
    platform::SetCurrentSystem({});
  }

  void Register() const {
    Check(platform::RegisterServerModule(modulePath), "registering the component");
  }

  void Refuse(std::size_t step, const std::u16string& reason) const {
    if (reason.empty()) return;
    throw MachineFileError(scriptFile + ": steps[" + std::to_string(step) +
                           "]: " + platform::ToUtf8(reason));
  }

  const std::string scriptFile;
  const Script script;
  const std::u16string modulePath;
  platform::simulated::SimulatedPc pc;
  // Made by the thread that plays the script: virtual time stands still while it works.
  platform::simulated::SimulatedDesktop desktop;
  platform::simulated::SimulatedRegistry registry;
  platform::simulated::SimulatedTypeLibraries typeLibraries;
  platform::simulated::SimulatedModuleEnvironment environment;
};

Pc::Pc(const std::string& machineFile, const std::string& scriptFile) {
  Machine machine = ReadMachine(machineFile);
  Script script = ReadScript(scriptFile, machine);
  for (const platform::simulated::Step& step : script) {
    m_steps.push_back({step.atMilliseconds, step.name});
  }
  m_state = std::make_unique<State>(scriptFile, std::move(script), std::move(machine));
}

Pc::~Pc() = default;

void Pc::ApplyAll() {
  for (std::size_t step = 0; step < m_state->script.size(); ++step) {
    m_state->Refuse(step, m_state->pc.Apply(m_state->script[step]));
  }
}

void Pc::Play(std::size_t step) {
  const platform::simulated::Step& played = m_state->script.at(step);
  m_state->Refuse(step, platform::simulated::PlayStep(m_state->pc, m_state->desktop, played));
  WaitFor(0);
}

void Pc::WaitFor(std::uint32_t milliseconds) { m_state->desktop.RunFor(milliseconds); }

void Pc::Settle() { m_state->desktop.Settle(); }

std::uint64_t Pc::Now() const { return m_state->desktop.Now(); }

std::vector<std::u16string> Pc::RegistryLines() const { return m_state->registry.Snapshot(); }

void Pc::Register() { m_state->Register(); }

void Pc::Unregister() {
  Check(platform::UnregisterServerModule(m_state->modulePath), "unregistering the component");
}

}  // namespace zkusb
