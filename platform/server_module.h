// A COM server's file, as a program handles it that brings the server along.
#pragma once

#include <string>

#include "platform/com.h"

namespace platform {

// The component's file beside the running program: libZKUsbMonitor.so, ZKUsbMonitor.dll on Windows.
// A full path. Throws std::runtime_error when the program cannot tell where it lies.
std::u16string ServerModulePath();

// Calls DllRegisterServer or DllUnregisterServer of that file, which it loads for the call. What
// the function says; CO_E_DLLNOTFOUND or CO_E_ERRORINDLL where there is none to call. Throws
// std::bad_alloc.
HRESULT RegisterServerModule(const std::u16string& path);
HRESULT UnregisterServerModule(const std::u16string& path);

}  // namespace platform
