#include "tests/windows/registered_device.h"

#include "platform/windows/native_types.h"

namespace platform::windows {

RegisteredDevice::RegisteredDevice(const std::u16string& id, const Guid& deviceClass) {
  m_set = SetupDiCreateDeviceInfoList(nullptr, nullptr);
  Note(m_set != INVALID_HANDLE_VALUE);
  m_data.cbSize = sizeof m_data;
  Note(SetupDiCreateDeviceInfoW(m_set, Native(id.c_str()), Native(&deviceClass), nullptr, nullptr, 0, &m_data));
  Note(SetupDiRegisterDeviceInfo(m_set, &m_data, 0, nullptr, nullptr, nullptr));
}

RegisteredDevice::~RegisteredDevice() {
  SetupDiRemoveDevice(m_set, &m_data);
  SetupDiDestroyDeviceInfoList(m_set);
}

void RegisteredDevice::SetText(DWORD property, const std::u16string& text) {
  Note(SetupDiSetDeviceRegistryPropertyW(m_set, &m_data, property, reinterpret_cast<const BYTE*>(text.c_str()),
                                         static_cast<DWORD>((text.size() + 1) * sizeof(char16_t))));
}

void RegisteredDevice::SetNumber(DWORD property, DWORD value) {
  Note(
      SetupDiSetDeviceRegistryPropertyW(m_set, &m_data, property, reinterpret_cast<const BYTE*>(&value), sizeof value));
}

void RegisteredDevice::AddInterface(const Guid& interfaceClass) {
  Note(SetupDiCreateDeviceInterfaceW(m_set, &m_data, Native(&interfaceClass), nullptr, 0, nullptr));
}

void RegisteredDevice::Note(BOOL succeeded) noexcept {
  if (!succeeded && m_error == 0) m_error = GetLastError() == 0 ? ERROR_GEN_FAILURE : GetLastError();
}

}  // namespace platform::windows
