// How a text property reaches the caller.
#pragma once

#include <string_view>

#include "com/com_error.h"
#include "platform/com.h"
#include "records/record_lock.h"
#include "records/ring_ptr.h"

namespace KelvoUHW {

// A text is first made into a BSTR of its own, which raises E_OUTOFMEMORY when it cannot be, and
// only then is the out pointer tested. Both are deliberate: callers see the exception also where
// they pass null.
class IntermediateBstr {
 public:
  explicit IntermediateBstr(std::u16string_view text);
  ~IntermediateBstr() { SysFreeString(m_text); }
  IntermediateBstr(const IntermediateBstr&) = delete;
  IntermediateBstr& operator=(const IntermediateBstr&) = delete;

  // A second copy for the caller: E_POINTER for null, E_OUTOFMEMORY when the copy cannot be made.
  HRESULT CopyTo(BSTR* out) const noexcept;

 private:
  BSTR m_text;
};

// `read` gives the text, as a view or a string of its own; it is called also where `out` is null.
template <class Read>
HRESULT ReadText(BSTR* out, Read read) {
  return GuardedRaising([&] {
    if (out) *out = nullptr;
    const RecordReadLock lock;
    // What was read is freed before the second copy: a dump may have many megabytes.
    const IntermediateBstr text(read());
    return text.CopyTo(out);
  });
}

// The text of a record. `empty` is the answer where the object holds none any more, which comes
// before everything else.
template <class Record, class Read>
HRESULT ReadTextOf(const RingPtr<Record>& record, HRESULT empty, BSTR* out, Read read) {
  if (out) *out = nullptr;
  const RecordReadLock lock;
  if (!record) return empty;
  return ReadText(out, [&] { return read(*record); });
}

}  // namespace KelvoUHW
