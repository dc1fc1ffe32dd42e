#include "platform/file_io.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

namespace qr {

bool InputBuffer::readAll(int fd) {
  struct stat st;
  size_t expected = ::fstat(fd, &st) == 0 && S_ISREG(st.st_mode) && st.st_size > 0
                        ? static_cast<size_t>(st.st_size)
                        : 0;
  for (;;) {
    if (capacity_ - size_ < (expected ? 1 : 4096)) {
      size_t grown = capacity_ ? 2 * capacity_ : expected + 1 + (expected ? 0 : 65536);
      char* p = static_cast<char*>(std::realloc(data_.get(), grown));
      if (!p) return false;
      data_.release();
      data_.reset(p);
      capacity_ = grown;
    }
    ssize_t n = ::read(fd, data_.get() + size_, capacity_ - size_);
    if (n > 0) size_ += static_cast<size_t>(n);
    if (n == 0) return true;
    if (n < 0 && errno != EINTR) return false;
  }
}

bool writeAll(int fd, std::string_view bytes) {
  while (!bytes.empty()) {
    ssize_t n = ::write(fd, bytes.data(), bytes.size());
    if (n < 0 && errno == EINTR) continue;
    if (n <= 0) return false;
    bytes.remove_prefix(static_cast<size_t>(n));
  }
  return true;
}

std::optional<std::string> readFile(const std::string& path) {
  int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  if (fd < 0) return std::nullopt;
  InputBuffer input;  // sized from the file's length
  bool ok = input.readAll(fd);
  ::close(fd);
  if (!ok) return std::nullopt;
  return std::string(input.view());
}

bool writeFile(const std::string& path, std::string_view bytes) {
  int fd = ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
  if (fd < 0) return false;
  bool ok = writeAll(fd, bytes);
  if (::close(fd) != 0) ok = false;
  return ok;
}

bool isDirectory(const std::string& path) {
  struct stat st;
  return ::stat(path.c_str(), &st) == 0 && S_ISDIR(st.st_mode);
}

bool isReadableFile(const std::string& path) {
  struct stat st;
  return ::stat(path.c_str(), &st) == 0 && S_ISREG(st.st_mode) && ::access(path.c_str(), R_OK) == 0;
}

}  // namespace qr
