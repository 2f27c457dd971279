// A stand-in for a smart pointer that some compilers bring and these do not: it asks of an interface what that one is
// documented to ask, which is a uuid for the type, an AddRef and a Release, and that a class can derive from it.
#pragma once

template <class T>
class NoAddRefRelease : public T {
  ULONG STDMETHODCALLTYPE AddRef() override = 0;
  ULONG STDMETHODCALLTYPE Release() override = 0;
};

template <class T>
class CComPtr {
 public:
  CComPtr() = default;
  CComPtr(T* object) : p(object) {
    if (p != nullptr) p->AddRef();
  }
  CComPtr(const CComPtr& other) : CComPtr(other.p) {}
  ~CComPtr() {
    if (p != nullptr) p->Release();
  }
  CComPtr& operator=(const CComPtr&) = delete;

  operator T*() const { return p; }
  T** operator&() { return &p; }
  NoAddRefRelease<T>* operator->() const { return static_cast<NoAddRefRelease<T>*>(p); }
  HRESULT CoCreateInstance(const CLSID& clsid, IUnknown* outer = nullptr, DWORD context = CLSCTX_INPROC_SERVER) {
    return ::CoCreateInstance(clsid, outer, context, __uuidof(T), reinterpret_cast<void**>(&p));
  }
  template <class Q>
  HRESULT QueryInterface(Q** other) const {
    return p->QueryInterface(__uuidof(Q), reinterpret_cast<void**>(other));
  }

  T* p = nullptr;
};
