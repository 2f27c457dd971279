// One USB interface descriptor as an object.
#pragma once

#include "com/object.h"
#include "com/zkusb_monitor.h"
#include "records/interface_entry.h"

namespace KelvoUHW {

// Keeps the entry, which owns its bytes: it answers also when the port device is gone. Callable
// from every thread.
class CZKUMInterfaceDescr : public ObjectRoot, public IZKUMInterfaceDescr {
 public:
  using Interfaces = InterfaceMap<IZKUMInterfaceDescr>;

  // E_INVALIDARG for a null pointer.
  HRESULT STDMETHODCALLTYPE get_InterfaceClass(BYTE* pVal) noexcept override;
  HRESULT STDMETHODCALLTYPE get_InterfaceSubClass(BYTE* pVal) noexcept override;
  HRESULT STDMETHODCALLTYPE get_InterfaceProtocol(BYTE* pVal) noexcept override;

  virtual ~CZKUMInterfaceDescr();
  void SetEntry(const InterfaceEntryPtr& entry) noexcept { m_entry = entry; }

 private:
  HRESULT ByteAt(std::size_t offset, BYTE* pVal) const noexcept;

  InterfaceEntryPtr m_entry;
};

}  // namespace KelvoUHW
