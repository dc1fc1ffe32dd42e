#include "platform/file_stamp.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

namespace qr {
namespace {

// Wider than the coarsest file-system timestamps (FAT keeps two seconds).
constexpr int64_t kRacyWindowNs = 3'000'000'000;

// Reads to the end of file; none on an error or when the file grew past maxSize
// while being read.
std::optional<std::string> readAtMost(int fd, size_t expected, size_t maxSize) {
  std::string bytes;
  bytes.reserve(expected);
  char buf[16384];
  for (;;) {
    ssize_t n = ::read(fd, buf, sizeof buf);
    if (n < 0 && errno == EINTR) continue;
    if (n < 0) return std::nullopt;
    if (n == 0) return bytes;
    if (bytes.size() + size_t(n) > maxSize) return std::nullopt;
    bytes.append(buf, size_t(n));
  }
}

}  // namespace

int64_t nanoseconds(const timespec& t) noexcept {
  return int64_t(t.tv_sec) * 1'000'000'000 + t.tv_nsec;
}

timespec fromNanoseconds(int64_t ns) noexcept {
  timespec t{};
  t.tv_sec = ns / 1'000'000'000;
  t.tv_nsec = ns % 1'000'000'000;
  if (t.tv_nsec < 0) {
    t.tv_nsec += 1'000'000'000;
    --t.tv_sec;
  }
  return t;
}

FileStamp FileStamp::of(const struct stat& st) noexcept {
  FileStamp s;
  s.device = st.st_dev;
  s.inode = st.st_ino;
  s.size = st.st_size;
  s.mode = st.st_mode;
  s.modified = st.st_mtim;
  s.changed = st.st_ctim;
  return s;
}

std::optional<FileStamp> FileStamp::of(const std::string& path) noexcept {
  struct stat st;
  if (::stat(path.c_str(), &st) != 0) return std::nullopt;
  return of(st);
}

bool FileStamp::isRacy() const noexcept {
  timespec now;
  if (clock_gettime(CLOCK_REALTIME, &now) != 0) return true;
  return nanoseconds(now) - nanoseconds(modified) < kRacyWindowNs;
}

bool FileStamp::operator==(const FileStamp& o) const noexcept {
  return device == o.device && inode == o.inode && size == o.size && mode == o.mode &&
         nanoseconds(modified) == nanoseconds(o.modified) &&
         nanoseconds(changed) == nanoseconds(o.changed);
}

StampedFile readStampedFile(const std::string& path, size_t maxSize) {
  StampedFile result;
  int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);
  if (fd < 0) return result;
  struct stat st;
  if (::fstat(fd, &st) != 0) {
    ::close(fd);
    return result;
  }
  result.stamp = FileStamp::of(st);
  if (S_ISREG(st.st_mode) && st.st_size >= 0 && size_t(st.st_size) <= maxSize) {
    result.bytes = readAtMost(fd, size_t(st.st_size), maxSize);
  }
  ::close(fd);
  return result;
}

}  // namespace qr
