#include "platform/directory_walk.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <memory>
#include <optional>
#include <string_view>
#include <utility>

namespace qr {
namespace {

struct DirectoryId {
  dev_t device;
  ino_t inode;
  bool operator==(const DirectoryId&) const = default;
};

// The directory behind path, links followed; none for anything else.
std::optional<DirectoryId> directoryAt(const std::string& path) {
  struct stat st;
  if (stat(path.c_str(), &st) != 0 || !S_ISDIR(st.st_mode)) return std::nullopt;
  return DirectoryId{st.st_dev, st.st_ino};
}

class Walk {
 public:
  explicit Walk(const DirectoryVisitor& visit) : visit_(visit) {}

  // id is known when path was stat'ed on the way (links, unknown types, roots).
  void directory(const std::string& path, int level, std::optional<DirectoryId> id) {
    if (id && isAncestor(*id)) return;
    if (!visit_(path, level)) return;
    int fd = open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (fd < 0) return;
    struct stat st;
    if (fstat(fd, &st) != 0 || isAncestor({st.st_dev, st.st_ino})) {
      close(fd);
      return;
    }
    std::unique_ptr<DIR, int (*)(DIR*)> dir(fdopendir(fd), closedir);
    if (!dir) {
      close(fd);
      return;
    }
    // The whole listing first, so that only one folder is open at a time
    // however deep the walk goes.
    std::vector<std::pair<std::string, unsigned char>> entries;
    while (dirent* entry = readdir(dir.get())) {
      std::string_view name = entry->d_name;
      if (name != "." && name != "..") entries.emplace_back(name, entry->d_type);
    }
    dir.reset();

    ancestors_.push_back({st.st_dev, st.st_ino});
    std::string base = path;
    if (!base.empty() && base.back() == '/') base.pop_back();
    for (const auto& [name, type] : entries) {
      std::string child = base + "/" + name;
      if (type == DT_DIR) {
        directory(child, level + 1, std::nullopt);
      } else if (type == DT_LNK || type == DT_UNKNOWN) {
        if (auto childId = directoryAt(child)) directory(child, level + 1, childId);
      }
    }
    ancestors_.pop_back();
  }

 private:
  bool isAncestor(const DirectoryId& id) const {
    return std::find(ancestors_.begin(), ancestors_.end(), id) != ancestors_.end();
  }

  const DirectoryVisitor& visit_;
  std::vector<DirectoryId> ancestors_;
};

}  // namespace

void walkDirectories(const std::vector<std::string>& roots, const DirectoryVisitor& visit) {
  for (const auto& root : roots) {
    if (root.empty()) continue;
    if (auto id = directoryAt(root)) Walk(visit).directory(root, 0, id);
  }
}

}  // namespace qr
