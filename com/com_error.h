// Errors inside COM methods: the exception that carries a code, and the guard that turns what was
// thrown into one.
#pragma once

#include <exception>
#include <new>

#include "platform/com.h"

namespace KelvoUHW {

// Derives from std::exception, so that a client which catches that catches the getters that raise.
class ComError final : public std::exception {
 public:
  explicit ComError(HRESULT code) noexcept : m_code(code) {}
  HRESULT Code() const noexcept { return m_code; }
  const char* what() const noexcept override { return "ZKUsbMonitor: COM error"; }

 private:
  HRESULT m_code;
};

// Runs a method's body, which returns an HRESULT; what it throws becomes its code.
template <class Body>
HRESULT Guarded(Body body) noexcept {
  try {
    return body();
  } catch (const ComError& error) {
    return error.Code();
  } catch (const std::bad_alloc&) {
    return E_OUTOFMEMORY;
  } catch (...) {
    return E_FAIL;
  }
}

// The same for a method that raises: its own errors go on to the caller.
template <class Body>
HRESULT GuardedRaising(Body body) {
  try {
    return body();
  } catch (const ComError&) {
    throw;
  } catch (const std::bad_alloc&) {
    return E_OUTOFMEMORY;
  } catch (...) {
    return E_FAIL;
  }
}

}  // namespace KelvoUHW
