// Registry scripts of any content: each is refused or read into balanced steps; what is carried out
// closes its keys, refuses nothing half-read, and is taken back again.
#include <vector>

#include "fuzz/fuzz.h"
#include "module/registrar.h"
#include "platform/text.h"
#include "simulation/process/registry.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace KelvoUHW;
  using fuzz::Require;
  const std::u16string script =
      platform::FromUtf8(std::string_view(reinterpret_cast<const char*>(data), size));
  const std::vector<Replacement> replacements = {{u"MODULE", u"C:\\a%B%\\{x}.dll"}, {u"NONE", u""}};

  const auto replaced = WithReplacements(script, replacements);
  const auto steps = replaced ? ParseRegistryScript(*replaced) : std::nullopt;
  bool deletes = false;
  if (steps) {
    std::size_t open = 0;
    for (const ScriptStep& step : *steps) {
      if (step.kind == ScriptStep::Kind::OpenKey) ++open;
      if (step.kind == ScriptStep::Kind::CloseKey) Require(open-- > 0, "a key to close");
      deletes = deletes || step.kind == ScriptStep::Kind::DeleteKey || step.noRemove;
    }
    Require(open == 0, "every key is closed");
  }

  platform::simulated::SimulatedRegistry registry;
  const HRESULT written = RegisterScript(registry, script, replacements);
  Require(steps.has_value() || written == DISP_E_EXCEPTION, "unreadable scripts are refused");
  Require(steps.has_value() || registry.Snapshot().empty(), "and write nothing");
  const HRESULT removed = UnregisterScript(registry, script, replacements);
  Require(registry.OpenKeys().empty() && registry.Misuses().empty(), "keys closed once");
  if (written == S_OK && removed == S_OK && !deletes) {
    Require(registry.Snapshot().empty(), "taken back");
  }
  return 0;
}
