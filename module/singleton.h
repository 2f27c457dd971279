// One shared instance of a class for the whole process, and the class object that hands it out.
#pragma once

#include <atomic>
#include <new>

#include "com/com_ptr.h"
#include "com/manual_lifetime.h"
#include "com/object.h"

namespace KelvoUHW {

template <class T, class Base>
class CSingletonExComObject2;

// Process-wide state of a class: the one live instance, not owned, and the lock that guards it.
// Made at module load, deleted at unload: nothing here depends on the order of static destructors.
template <class T, class Base>
struct SingletonState {
  static inline constinit std::atomic<CSingletonExComObject2<T, Base>*> s_pInstance = nullptr;
  static platform::CriticalSection& Lock() noexcept { return *s_lock; }

  static HRESULT Initialize() noexcept { return s_lock.Make().Initialize(); }
  static void Delete() noexcept { s_lock.Destroy(); }

 private:
  static inline constinit ManualLifetime<platform::CriticalSection> s_lock;
};

// Drops one reference. True, with the lock held, when it was the last. The lock is taken before the
// last decrement: otherwise another thread could be handed an object that is being destroyed.
inline bool ReleaseAndLockIfLast(std::atomic<LONG>& count, platform::CriticalSection& lock) {
  LONG current = count.load();
  while (current - 1 != 0) {
    if (count.compare_exchange_weak(current, current - 1)) return false;
  }
  lock.lock();
  if (--count == 0) return true;
  lock.unlock();
  return false;
}

// The instance. References are interlocked; any thread may release the last one.
template <class T, class Base>
class CSingletonExComObject2 final : public T {
 public:
  CSingletonExComObject2() { LockModule(); }
  ~CSingletonExComObject2() override {
    this->m_nRef = T::kDead;
    this->FinalRelease();
    UnlockModule();
  }

  HRESULT STDMETHODCALLTYPE QueryInterface(REFIID iid, void** out) noexcept override {
    return QueryByMap<T>(this, iid, out);
  }
  ULONG STDMETHODCALLTYPE AddRef() noexcept override { return static_cast<ULONG>(++this->m_nRef); }
  // 0 when it destroyed the object, else 255 and not the count that is left. This is deliberate.
  ULONG STDMETHODCALLTYPE Release() noexcept override {
    using State = SingletonState<T, Base>;
    platform::CriticalSection& lock = State::Lock();
    if (!ReleaseAndLockIfLast(this->m_nRef, lock)) return 255;
    delete this;
    State::s_pInstance = nullptr;
    lock.unlock();
    return 0;
  }

  // A new instance without references; `out` stays null on failure. The caller holds the lock.
  static HRESULT Create(CSingletonExComObject2*& out) noexcept {
    return Guarded([&] {
      // NOLINTNEXTLINE(bugprone-unhandled-exception-at-new): Guarded catches it
      auto* object = new CSingletonExComObject2;
      ++object->m_nRef;  // FinalConstruct may hand the object out and take it back
      HRESULT result = object->InitializeLock();
      if (SUCCEEDED(result)) result = object->FinalConstruct();
      --object->m_nRef;
      if (FAILED(result)) {
        delete object;
        return result;
      }
      out = object;
      return S_OK;
    });
  }
};

// The class object of `T`. Callable from every thread.
template <class T, class Base>
class CComSingletonExClassFactory : public ObjectRoot, public IClassFactory {
 public:
  using Interfaces = InterfaceMap<IClassFactory>;
  using Instance = CSingletonExComObject2<T, Base>;
  using State = SingletonState<T, Base>;

  HRESULT STDMETHODCALLTYPE CreateInstance(IUnknown* pUnkOuter, REFIID riid,
                                           void** ppv) noexcept override {
    if (ppv == nullptr) return E_POINTER;
    *ppv = nullptr;
    if (pUnkOuter != nullptr) return CLASS_E_NOAGGREGATION;
    ComPtr<IUnknown> instance;
    const HRESULT result = GetInstance(instance.Put());
    return FAILED(result) ? result : instance->QueryInterface(riid, ppv);
  }
  HRESULT STDMETHODCALLTYPE LockServer(BOOL fLock) noexcept override {
    fLock ? LockModule() : UnlockModule();
    return S_OK;
  }

  virtual ~CComSingletonExClassFactory() = default;

 private:
  static HRESULT GetInstance(IUnknown** out) noexcept {
    State::Lock().lock();
    Instance* instance = State::s_pInstance;
    HRESULT result = S_OK;
    if (instance == nullptr) result = Instance::Create(instance);
    if (instance != nullptr) {
      instance->AddRef();
      State::s_pInstance = instance;
    }
    State::Lock().unlock();
    if (FAILED(result)) return result;
    result = instance->QueryInterface(platform::IidOf<IUnknown>(), reinterpret_cast<void**>(out));
    instance->Release();
    return result;
  }
};

// A class object as the module caches it: the module's own reference does not keep it loaded, the
// first one of a client does.
template <class Class>
class CachedComObject final : public Class {
 public:
  // With one reference, for the cache.
  static HRESULT Create(CachedComObject*& out) noexcept {
    return Guarded([&] {
      // NOLINTNEXTLINE(bugprone-unhandled-exception-at-new): Guarded catches it
      auto* object = new CachedComObject;
      object->m_nRef = 1;
      const HRESULT result = object->InitializeLock();
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
  ULONG STDMETHODCALLTYPE AddRef() noexcept override {
    const LONG count = ++this->m_nRef;
    if (count == 2) LockModule();
    return static_cast<ULONG>(count);
  }
  ULONG STDMETHODCALLTYPE Release() noexcept override {
    const LONG count = --this->m_nRef;
    if (count == 1) UnlockModule();
    if (count == 0) delete this;
    return static_cast<ULONG>(count);
  }

 private:
  CachedComObject() = default;
  ~CachedComObject() override { this->m_nRef = Class::kDead; }
};

}  // namespace KelvoUHW
