#include "platform/output_blocks.h"

#include <sys/mman.h>

#include <cstring>
#include <new>

namespace qr {
namespace {
// Pages of a mapping count only once touched, so a large block costs a small
// output nothing but address space.
constexpr size_t kBlockSize = 4 << 20;
}  // namespace

OutputBlocks::~OutputBlocks() { release(); }

void OutputBlocks::release() noexcept {
  for (const Block& b : blocks_) munmap(b.base, b.capacity);
  blocks_.clear();
  cursor_ = limit_ = nullptr;
}

void OutputBlocks::addBlock(size_t atLeast) {
  if (!blocks_.empty()) blocks_.back().used = static_cast<size_t>(cursor_ - blocks_.back().base);
  size_t capacity =
      atLeast > kBlockSize ? (atLeast + kBlockSize - 1) / kBlockSize * kBlockSize : kBlockSize;
  blocks_.reserve(blocks_.size() + 1);
  void* base = mmap(nullptr, capacity, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  if (base == MAP_FAILED) throw std::bad_alloc();
  blocks_.push_back({static_cast<char*>(base), capacity, 0});
  cursor_ = static_cast<char*>(base);
  limit_ = cursor_ + capacity;
}

void OutputBlocks::append(const char* bytes, size_t n) {
  char* p = reserve(n);
  if (n) std::memcpy(p, bytes, n);
  commit(p + n);
}

size_t OutputBlocks::size() const noexcept {
  size_t total = 0;
  for (size_t i = 0; i + 1 < blocks_.size(); ++i) total += blocks_[i].used;
  if (!blocks_.empty()) total += static_cast<size_t>(cursor_ - blocks_.back().base);
  return total;
}

std::string OutputBlocks::finish() {
  std::string out;
  out.reserve(size());
  if (!blocks_.empty()) blocks_.back().used = static_cast<size_t>(cursor_ - blocks_.back().base);
  for (Block& b : blocks_) {
    out.append(b.base, b.used);
    munmap(b.base, b.capacity);
    b.capacity = 0;
  }
  blocks_.clear();
  cursor_ = limit_ = nullptr;
  return out;
}

}  // namespace qr
