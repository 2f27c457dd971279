// The registrar: carries out registry scripts.
#pragma once

#include <span>
#include <string_view>

#include "module/registry_script.h"
#include "platform/com.h"
#include "platform/registry.h"

namespace KelvoUHW {

// Both walk the script (registry_script.h gives its syntax) below HKEY_CLASSES_ROOT and return S_OK
// or the first failure, behind which nothing more is done and nothing is taken back:
// DISP_E_EXCEPTION for a script or a replacement that cannot be read, when nothing was written yet;
// a failure of the registry as an HRESULT. They may be called from every thread and take no lock;
// std::bad_alloc may be thrown.

// Writes keys and values. A ForceRemove key and a Delete key are deleted with all below them first.
HRESULT RegisterScript(platform::Registry& registry, std::u16string_view script,
                       std::span<const Replacement> replacements);

// Deletes the named values, and each named key without subkeys when all below it has been handled;
// what is marked NoRemove stays. A key kept for a subkey that the script does not name keeps its
// default value. What is gone already is no failure.
HRESULT UnregisterScript(platform::Registry& registry, std::u16string_view script,
                         std::span<const Replacement> replacements);

// A failure of a platform call as an HRESULT, also where the system set no code.
HRESULT ToHresult(const platform::Status& failure) noexcept;

}  // namespace KelvoUHW
