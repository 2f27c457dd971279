// The machine file that is part of the program.
#pragma once

#include <string_view>

namespace platform::simulated {

// How messages name it.
inline constexpr char kBuiltInMachineName[] = "built-in machine";

// Its text, which lives as long as the program.
std::string_view BuiltInMachine() noexcept;

}  // namespace platform::simulated
