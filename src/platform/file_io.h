// Whole-file reads and writes, and descriptor I/O that survives EINTR and short counts.
#pragma once

#include <cstdlib>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

namespace qr {

// The file's bytes; none when it cannot be opened or read.
std::optional<std::string> readFile(const std::string& path);
// Creates or truncates the file and writes the bytes in place.
bool writeFile(const std::string& path, std::string_view bytes);
// Writes every byte, retrying interrupted calls and short counts.
bool writeAll(int fd, std::string_view bytes);
// Bytes read to the end of a descriptor into memory never written before:
// for inputs of many megabytes, where zeroing a string first would touch
// every page twice.
class InputBuffer {
 public:
  // False on an error other than EINTR; what was read stays.
  bool readAll(int fd);
  std::string_view view() const noexcept { return {data_.get(), size_}; }

 private:
  struct Free {
    void operator()(char* p) const noexcept { std::free(p); }
  };
  std::unique_ptr<char, Free> data_;
  size_t size_ = 0;
  size_t capacity_ = 0;
};

bool isDirectory(const std::string& path);
bool isReadableFile(const std::string& path);

}  // namespace qr
