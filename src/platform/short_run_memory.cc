#include "platform/short_run_memory.h"

#include <malloc.h>
#include <sys/mman.h>
#include <unistd.h>

#include <cstdint>
#include <cstdlib>

namespace qr {

void tuneHeapForShortRun() {
  constexpr size_t kMiB = size_t(1) << 20;
  constexpr size_t kPad = 64 * kMiB;  // address space only: pages come when touched
  constexpr uintptr_t kHugePage = 2 * kMiB;
  mallopt(M_TRIM_THRESHOLD, int(2 * kPad));
  mallopt(M_MMAP_THRESHOLD, int(32 * kMiB));  // the most glibc allows
  mallopt(M_TOP_PAD, int(kPad));
  // A block larger than what is left at the top makes the heap grow now, by
  // the block and the pad; freed, it stays there for the run to use.
  void* block = std::malloc(16 * kMiB);
  if (!block) return;
  auto begin = reinterpret_cast<uintptr_t>(block);
  auto end = reinterpret_cast<uintptr_t>(sbrk(0));
  std::free(block);
  // Only when the block came from the program break's heap.
  if (end < begin || end - begin > 2 * (16 * kMiB + kPad)) return;
  begin = (begin + kHugePage - 1) & ~(kHugePage - 1);
  end &= ~(kHugePage - 1);
  if (end > begin) madvise(reinterpret_cast<void*>(begin), end - begin, MADV_HUGEPAGE);
}

}  // namespace qr
