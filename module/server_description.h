// What the module registers.
#pragma once

#include <span>
#include <string_view>

#include "platform/guid.h"

namespace KelvoUHW {

// A creatable class as it is registered. Its component categories, description and start-up work
// are none.
struct RegisteredClass {
  platform::Guid clsid;
  std::string_view script;  // UTF-8; the texts below are its replacements
  std::u16string_view progId;
  std::u16string_view version;
  std::u16string_view description;
  std::u16string_view threading;
};

struct ServerDescription {
  platform::Guid libId;
  std::string_view script;                   // of the module itself, UTF-8
  std::span<const RegisteredClass> classes;  // in the order in which they are registered
};

// This module's. Lives as long as the module.
const ServerDescription& ModuleDescription() noexcept;

}  // namespace KelvoUHW
