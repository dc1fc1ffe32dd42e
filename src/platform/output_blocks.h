// An append-only byte buffer for large generated text. It grows by whole
// blocks taken straight from the system, so growing never copies what was
// written, and finish() hands each block back as soon as it is copied out:
// producing N bytes of text holds about N bytes plus one block, not the 2N
// to 3N of a string that doubles.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

namespace qr {

class OutputBlocks {
 public:
  OutputBlocks() = default;
  OutputBlocks(const OutputBlocks&) = delete;
  OutputBlocks& operator=(const OutputBlocks&) = delete;
  ~OutputBlocks();

  // Room for at least n more bytes at the returned cursor; write there and
  // pass the advanced cursor to commit(). Throws std::bad_alloc.
  char* reserve(size_t n) {
    if (static_cast<size_t>(limit_ - cursor_) < n) addBlock(n);
    return cursor_;
  }
  void commit(char* end) noexcept { cursor_ = end; }

  void append(const char* bytes, size_t n);
  size_t size() const noexcept;
  // Everything written, in one string; the buffer is empty afterwards.
  std::string finish();

 private:
  struct Block {
    char* base;
    size_t capacity;
    size_t used;
  };
  void addBlock(size_t atLeast);
  void release() noexcept;

  std::vector<Block> blocks_;
  char* cursor_ = nullptr;
  char* limit_ = nullptr;
};

}  // namespace qr
