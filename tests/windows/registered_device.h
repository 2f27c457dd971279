// A device that is written into the system's registry with the system's own functions.
#pragma once

#include <windows.h>

#include <setupapi.h>

#include <string>

#include "platform/host.h"

namespace platform::windows {

// Taken out again by its owner's end.
class RegisteredDevice {
 public:
  // `id` is the whole instance id. Check Error() before use.
  RegisteredDevice(const std::u16string& id, const Guid& deviceClass);
  ~RegisteredDevice();
  RegisteredDevice(const RegisteredDevice&) = delete;
  RegisteredDevice& operator=(const RegisteredDevice&) = delete;

  // The system's code of the first call that failed; 0: none did.
  DWORD Error() const noexcept { return m_error; }
  DWORD Node() const noexcept { return m_data.DevInst; }

  // The characters of `text` and a zero behind them: a list of texts has zeros inside.
  void SetText(DWORD property, const std::u16string& text);
  void SetNumber(DWORD property, DWORD value);
  void AddInterface(const Guid& interfaceClass);

 private:
  void Note(BOOL succeeded) noexcept;

  HDEVINFO m_set = INVALID_HANDLE_VALUE;
  ::SP_DEVINFO_DATA m_data{};
  DWORD m_error = 0;
};

}  // namespace platform::windows
