#include <windows.h>

#include "platform/text.h"

namespace platform {
namespace {

// A pointer below 64 Ki is taken for the character itself, and so is what comes back.
template <class Call>
char16_t Mapped(Call* call, char16_t unit) noexcept {
  WCHAR* const character = reinterpret_cast<WCHAR*>(static_cast<std::uintptr_t>(unit));
  return static_cast<char16_t>(reinterpret_cast<std::uintptr_t>(call(character)));
}

}  // namespace

// Names of devices are ASCII nearly always, and are compared often.
char16_t ToLower(char16_t unit) noexcept {
  if (unit < 0x80) return unit >= u'A' && unit <= u'Z' ? static_cast<char16_t>(unit + 32) : unit;
  return Mapped(CharLowerW, unit);
}

char16_t ToUpper(char16_t unit) noexcept {
  if (unit < 0x80) return unit >= u'a' && unit <= u'z' ? static_cast<char16_t>(unit - 32) : unit;
  return Mapped(CharUpperW, unit);
}

}  // namespace platform
