#include "module/registrar.h"

#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/registry_key.h"

namespace KelvoUHW {
namespace {

using platform::Registry;
using platform::RegistryKey;
using platform::Status;

// Keys opened on the way down to where the script stands; HKEY_CLASSES_ROOT when there is none.
class OpenPath {
 public:
  explicit OpenPath(Registry& registry) : m_root(registry, platform::kHKEY_CLASSES_ROOT) {}

  RegistryKey& Innermost() { return m_levels.empty() ? m_root : m_levels.back().key; }
  void Enter(RegistryKey key, const ScriptStep& step) {
    m_levels.push_back({std::move(key), &step});
  }
  // Closes the innermost key and returns the step that opened it.
  const ScriptStep& Leave() {
    const ScriptStep& step = *m_levels.back().step;
    m_levels.pop_back();
    return step;
  }

 private:
  struct Level {
    RegistryKey key;
    const ScriptStep* step;
  };
  RegistryKey m_root;
  std::vector<Level> m_levels;
};

// ERROR_FILE_NOT_FOUND is what was wanted where something is to go.
Status GoneIsFine(Status status) {
  return status.error == platform::kERROR_FILE_NOT_FOUND ? Status::Success() : status;
}

Status SetData(Registry& registry, const RegistryKey& key, const std::u16string& name,
               const ScriptData& data) {
  return registry.SetValue(key.Handle(), name.c_str(), data.type, data.bytes.data(),
                           static_cast<std::uint32_t>(data.bytes.size()));
}

Status WriteStep(Registry& registry, const ScriptStep& step, OpenPath& path) {
  switch (step.kind) {
    case ScriptStep::Kind::CloseKey:
      path.Leave();
      return Status::Success();
    case ScriptStep::Kind::Value:
      return SetData(registry, path.Innermost(), step.name, *step.data);
    case ScriptStep::Kind::DeleteKey:
      return GoneIsFine(path.Innermost().DeleteTree(step.name));
    case ScriptStep::Kind::OpenKey:
      break;
  }
  if (step.forceRemove) {
    const Status removed = GoneIsFine(path.Innermost().DeleteTree(step.name));
    if (!removed) return removed;
  }
  RegistryKey key(registry);
  Status status = key.Create(path.Innermost().Handle(), step.name.c_str());
  if (status && step.data) status = SetData(registry, key, {}, *step.data);
  if (status) path.Enter(std::move(key), step);
  return status;
}

// Deletes a key of the innermost one unless it has subkeys.
Status DeleteIfEmpty(Registry& registry, OpenPath& path, bool empty, const ScriptStep& step) {
  if (!empty || step.noRemove) return Status::Success();
  return GoneIsFine(registry.DeleteKey(path.Innermost().Handle(), step.name.c_str()));
}

Status IsEmpty(const RegistryKey& key, bool& empty) {
  std::u16string subkey;
  const Status status = key.FirstSubkey(subkey);
  empty = !status && status.error == platform::kERROR_NO_MORE_ITEMS;
  return empty ? Status::Success() : status;
}

// `absent` counts the keys around this step, from outside in, that are not there.
Status RemoveStep(Registry& registry, const ScriptStep& step, OpenPath& path, std::size_t& absent) {
  bool empty = false;
  if (absent != 0) {
    if (step.kind == ScriptStep::Kind::OpenKey) ++absent;
    if (step.kind == ScriptStep::Kind::CloseKey) --absent;
    return Status::Success();
  }
  if (step.kind == ScriptStep::Kind::Value) {
    if (step.noRemove) return Status::Success();
    return GoneIsFine(registry.DeleteValue(path.Innermost().Handle(), step.name.c_str()));
  }
  if (step.kind == ScriptStep::Kind::CloseKey) {
    const Status status = IsEmpty(path.Innermost(), empty);
    const ScriptStep& opened = path.Leave();
    return status ? DeleteIfEmpty(registry, path, empty, opened) : status;
  }

  RegistryKey key(registry);
  Status status = key.Open(path.Innermost().Handle(), step.name.c_str());
  if (!status) {
    status = GoneIsFine(status);
    if (status && step.kind == ScriptStep::Kind::OpenKey) absent = 1;
    return status;
  }
  if (step.kind == ScriptStep::Kind::OpenKey) {
    path.Enter(std::move(key), step);
    return status;
  }
  status = IsEmpty(key, empty);
  key.Close();
  return status ? DeleteIfEmpty(registry, path, empty, step) : status;
}

// Nothing is written before the whole script has been read.
std::optional<std::vector<ScriptStep>> Read(std::u16string_view script,
                                            std::span<const Replacement> replacements) {
  const auto text = WithReplacements(script, replacements);
  return text ? ParseRegistryScript(*text) : std::nullopt;
}

}  // namespace

HRESULT RegisterScript(Registry& registry, std::u16string_view script,
                       std::span<const Replacement> replacements) {
  const auto steps = Read(script, replacements);
  if (!steps) return DISP_E_EXCEPTION;
  OpenPath path(registry);
  for (const ScriptStep& step : *steps) {
    if (const Status status = WriteStep(registry, step, path); !status) return ToHresult(status);
  }
  return S_OK;
}

HRESULT UnregisterScript(Registry& registry, std::u16string_view script,
                         std::span<const Replacement> replacements) {
  const auto steps = Read(script, replacements);
  if (!steps) return DISP_E_EXCEPTION;
  OpenPath path(registry);
  std::size_t absent = 0;
  for (const ScriptStep& step : *steps) {
    const Status status = RemoveStep(registry, step, path, absent);
    if (!status) return ToHresult(status);
  }
  return S_OK;
}

HRESULT ToHresult(const Status& failure) noexcept {
  const HRESULT result = HRESULT_FROM_WIN32(failure.error);
  return FAILED(result) ? result : E_FAIL;
}

}  // namespace KelvoUHW
