// Tells whether a file changed since it was read, from one stat() and no read:
// device, inode, size, and modification and status-change times to the
// nanosecond. A file modified within the last moments is "racy": a rewrite in
// the same clock tick could keep every field, so its stamp proves nothing and
// the file is read again.
#pragma once

#include <sys/stat.h>
#include <sys/types.h>

#include <ctime>
#include <optional>
#include <string>

namespace qr {

// Times as one count of nanoseconds since the epoch, and back.
int64_t nanoseconds(const timespec& t) noexcept;
timespec fromNanoseconds(int64_t ns) noexcept;

struct FileStamp {
  dev_t device = 0;
  ino_t inode = 0;
  off_t size = 0;
  mode_t mode = 0;
  timespec modified{};
  timespec changed{};

  static FileStamp of(const struct stat& st) noexcept;
  // None when the path cannot be stat'ed.
  static std::optional<FileStamp> of(const std::string& path) noexcept;

  bool isRegularFile() const noexcept { return S_ISREG(mode); }
  // Modified too recently (or in the future) for the stamp to be trusted.
  bool isRacy() const noexcept;
  bool operator==(const FileStamp& other) const noexcept;
};

// Whole-file read from one open descriptor, so that the stamp describes the
// bytes read. bytes is none when the file is not a regular file, is larger
// than maxSize or cannot be read; stamp is none when it cannot be opened.
struct StampedFile {
  std::optional<FileStamp> stamp;
  std::optional<std::string> bytes;
};
StampedFile readStampedFile(const std::string& path, size_t maxSize);

}  // namespace qr
