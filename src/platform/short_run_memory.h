// Heap settings for a program that runs briefly and builds some megabytes of
// trees. Where every first touch of a page traps (virtual machines), page
// faults were half of a warm cachewright run's system time.
#pragma once

namespace qr {

// Keeps freed memory for reuse rather than handing it back to be faulted in
// again, grows the heap in one step, and asks for huge pages behind it. Call
// it first thing in main(), before other threads exist. Harmless where the
// allocator is not glibc's or huge pages are off: the settings are then ignored.
void tuneHeapForShortRun();

}  // namespace qr
