#include "simulation/machine/built_in_machine.h"

namespace platform::simulated {

namespace {

constexpr unsigned char kBytes[] = {
#include "built_in_machine_bytes.inc"
};

}  // namespace

std::string_view BuiltInMachine() noexcept {
  return {reinterpret_cast<const char*>(kBytes), sizeof kBytes};
}

}  // namespace platform::simulated
