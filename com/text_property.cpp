#include "com/text_property.h"

#include "platform/text.h"

namespace KelvoUHW {

IntermediateBstr::IntermediateBstr(std::u16string_view text)
    : m_text(platform::MakeBstr(platform::UpToZero(text))) {
  if (m_text == nullptr) throw ComError(E_OUTOFMEMORY);
}

HRESULT IntermediateBstr::CopyTo(BSTR* out) const noexcept {
  if (out == nullptr) return E_POINTER;
  *out = platform::MakeBstr(platform::BstrText(m_text));
  return *out ? S_OK : E_OUTOFMEMORY;
}

}  // namespace KelvoUHW
