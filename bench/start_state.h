// What a measured piece of work starts from.
#pragma once

namespace bench {

// The process keeps what it frees, as a program does that has run for a while: otherwise the first
// touch of every page that the previous iteration gave back to the system would be measured. And it
// joins free pieces at once: otherwise what was freed before the work is joined in the middle of
// it. Call once, before the first measurement.
void KeepFreedMemory() noexcept;

// Walks and builds happen when a device comes or goes, minutes or hours apart, so they never find
// their data in the processor's caches, as they would in a benchmark that does nothing else: there
// the small PC fits and the large one does not. Fills the caches with other data.
void StartCold();

}  // namespace bench
