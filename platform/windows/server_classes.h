// A COM server's file beside a program, used without being registered.
#pragma once

#include <span>
#include <string>
#include <vector>

#include "platform/com.h"

namespace platform::windows {

// The classes of a server, for the process that loads it: CoCreateInstance finds them while this
// lives, whatever is registered for the machine. By one thread, which is in the multithreaded
// apartment as long. The file stays loaded.
class ServerClasses {
 public:
  // Throws std::runtime_error, with the path, when the file cannot be loaded or refuses a class.
  ServerClasses(const std::u16string& path, std::span<const CLSID> classes);
  ~ServerClasses();
  ServerClasses(const ServerClasses&) = delete;
  ServerClasses& operator=(const ServerClasses&) = delete;

 private:
  void Revoke() noexcept;

  std::vector<DWORD> m_cookies;
};

// A variable of the process's environment; empty where it is not set. Throws std::bad_alloc.
std::u16string EnvironmentText(const char16_t* name);
// For files that are loaded later. An empty text removes the variable.
void SetEnvironmentText(const char16_t* name, const std::u16string& text) noexcept;

}  // namespace platform::windows
