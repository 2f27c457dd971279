// The registration scripts of the module.
#pragma once

#include <cstdint>
#include <string_view>

namespace KelvoUHW {

// The numbers that the scripts have among the module's resources of the kind REGISTRY.
enum class ScriptResource : std::uint16_t { Module = 101, EventNotifier = 102, UsbTree = 103 };

// The text of a script in UTF-8, from module/scripts/. Empty for a number that none has.
std::string_view RegistryScript(ScriptResource resource) noexcept;

}  // namespace KelvoUHW
