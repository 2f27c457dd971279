// The framework of all objects of the component: reference counts, interface maps, creation.
#pragma once

#include <atomic>
#include <new>
#include <utility>

#include "com/com_error.h"
#include "com/module_lock.h"
#include "platform/com.h"
#include "platform/critical_section.h"

namespace KelvoUHW {

// What every object starts with: the reference count and a lock for what needs one. A derived class
// may hide FinalConstruct and FinalRelease with its own.
template <class Count>
class BasicObjectRoot {
 public:
  BasicObjectRoot(const BasicObjectRoot&) = delete;
  BasicObjectRoot& operator=(const BasicObjectRoot&) = delete;

  HRESULT FinalConstruct() noexcept { return S_OK; }
  void FinalRelease() noexcept {}
  HRESULT InitializeLock() noexcept { return m_section.Initialize(); }

 protected:
  // A count that no live object has: releasing references inside the destructor cannot reach zero
  // again.
  static constexpr LONG kDead = -0x3FFFFFFF;

  BasicObjectRoot() noexcept = default;
  ~BasicObjectRoot() = default;

  Count m_nRef = 0;
  platform::CriticalSection m_section;
};
using ObjectRoot = BasicObjectRoot<std::atomic<LONG>>;
// For objects that are used from one thread.
using SingleThreadObjectRoot = BasicObjectRoot<LONG>;

// The interfaces a class answers for. The first one is also its IUnknown, so each object has one
// identity.
template <class First, class... Others>
struct InterfaceMap {
  // No reference is taken; null for an interface that is not in the map.
  template <class Object>
  static void* Find(Object* object, REFIID iid) noexcept {
    if (iid == platform::IidOf<IUnknown>() || iid == platform::IidOf<First>()) {
      return static_cast<First*>(object);
    }
    void* found = nullptr;
    static_cast<void>(
        ((iid == platform::IidOf<Others>() && (found = static_cast<Others*>(object)) != nullptr) ||
         ...));
    return found;
  }
};

// QueryInterface by a class's `Interfaces`, an InterfaceMap.
template <class Class, class Object>
HRESULT QueryByMap(Object* object, REFIID iid, void** out) noexcept {
  if (out == nullptr) return E_POINTER;
  *out = Class::Interfaces::Find(static_cast<Class*>(object), iid);
  if (*out == nullptr) return E_NOINTERFACE;
  object->AddRef();
  return S_OK;
}

// One object in the module's lock count.
class ModuleReference {
 protected:
  ModuleReference() noexcept { LockModule(); }
  ModuleReference(const ModuleReference&) = delete;
  ModuleReference& operator=(const ModuleReference&) = delete;
  ~ModuleReference() { UnlockModule(); }
};

// The most derived class of an object whose class is `Class`: counts its references, interlocked,
// and itself towards the module's lock count. The module is let go last, behind all that the object
// holds: nothing may unload it while an object is being taken apart.
template <class Class>
class ComObject final : private ModuleReference, public Class {
 public:
  // An object with one reference, which is the caller's; null with the code on failure. The count
  // is above zero while FinalConstruct runs, so that it may hand itself out and take itself back.
  static HRESULT Create(ComObject*& out) noexcept {
    out = nullptr;
    return Guarded([&] {
      // Guarded answers E_OUTOFMEMORY. NOLINTNEXTLINE(bugprone-unhandled-exception-at-new)
      ComObject* object = new ComObject;
      object->m_nRef = 1;
      HRESULT result = object->InitializeLock();
      if (SUCCEEDED(result)) result = object->FinalConstruct();
      if (FAILED(result)) {
        delete object;
        return result;
      }
      out = object;
      return S_OK;
    });
  }

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) noexcept override {
    return QueryByMap<Class>(this, iid, out);
  }
  ULONG STDMETHODCALLTYPE AddRef() noexcept override { return static_cast<ULONG>(++this->m_nRef); }
  ULONG STDMETHODCALLTYPE Release() noexcept override {
    const LONG left = --this->m_nRef;
    if (left == 0) delete this;
    return static_cast<ULONG>(left);
  }

 private:
  ComObject() = default;
  ~ComObject() override {
    this->m_nRef = Class::kDead;
    this->FinalRelease();
  }
};

}  // namespace KelvoUHW
