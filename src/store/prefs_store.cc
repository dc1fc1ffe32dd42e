// The printing-preferences store. Readers parse the file as it stands; the
// atomic replace below means they always see a whole store. Writers serialize
// on an exclusive flock of "<store>.lock" and re-read under it, so a key
// written by another process in the meantime is kept.
#include "store/prefs_store.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <mutex>
#include <set>

#include "platform/file_io.h"
#include "platform/file_stamp.h"
#include "platform/log.h"
#include "plist/property_list.h"
#include "values/deep_copy.h"

namespace qr {
namespace {

// The store lives beside root-owned system state; it holds nothing secret.
constexpr mode_t kStoreMode = 0644;
constexpr mode_t kDirectoryMode = 0755;

std::string errorText(int error) { return std::strerror(error); }

// A broken store is reported once per process, path and kind of trouble, not
// at every read.
void logOnce(const std::string& path, const char* trouble, const std::string& message) {
  static std::mutex mutex;
  static std::set<std::string>* reported = new std::set<std::string>;
  {
    std::lock_guard<std::mutex> lock(mutex);
    if (!reported->insert(std::string(trouble) + ':' + path).second) return;
  }
  log("%s", message);
}

std::string directoryOf(const std::string& path) {
  size_t slash = path.rfind('/');
  if (slash == std::string::npos) return ".";
  if (slash == 0) return "/";
  return path.substr(0, slash);
}

std::string baseNameOf(const std::string& path) {
  size_t slash = path.rfind('/');
  return slash == std::string::npos ? path : path.substr(slash + 1);
}

// Creates the missing directories of the path (mkdir -p).
bool makeDirectories(const std::string& dir) {
  if (isDirectory(dir)) return true;
  for (size_t pos = 1; pos <= dir.size(); ++pos) {
    if (pos != dir.size() && dir[pos] != '/') continue;
    std::string prefix = dir.substr(0, pos);
    if (::mkdir(prefix.c_str(), kDirectoryMode) != 0 && errno != EEXIST) return false;
  }
  return isDirectory(dir);
}

// The last store this process parsed, with the bytes it came from. One run
// reads the store several times (the discovery switch, the module cache, the
// records, the writer's fresh read under the lock), and a store holding the
// cache of thousands of modules takes far longer to parse than to read.
// A store whose stamp is the one it had when parsed, and was not modified
// moments before, is taken as unchanged without a read (any write moves the
// status-change time, and the store is replaced, never edited, by writers);
// otherwise a read that finds the same bytes takes the dictionary parsed before.
class ParsedStoreMemo {
 public:
  Ref<Dictionary> findByStamp(const std::string& path, const FileStamp& stamp) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (path != path_ || !stampProves_ || !(stamp == stamp_)) return nullptr;
    return dictionary_;
  }
  Ref<Dictionary> findByBytes(const std::string& path, std::string_view bytes,
                              const FileStamp& stamp) {
    std::lock_guard<std::mutex> lock(mutex_);
    if (path != path_ || bytes != bytes_) return nullptr;
    restamp(stamp);
    return dictionary_;
  }
  void remember(const std::string& path, std::string_view bytes, const FileStamp& stamp,
                Ref<Dictionary> dictionary) {
    std::lock_guard<std::mutex> lock(mutex_);
    path_ = path;
    bytes_ = bytes;
    dictionary_ = std::move(dictionary);
    restamp(stamp);
  }

 private:
  void restamp(const FileStamp& stamp) {
    stamp_ = stamp;
    stampProves_ = !stamp.isRacy();
  }

  std::mutex mutex_;
  std::string path_;
  std::string bytes_;
  FileStamp stamp_;
  bool stampProves_ = false;
  Ref<Dictionary> dictionary_;  // immutable, so it can be handed to every reader
};

ParsedStoreMemo& parsedStoreMemo() {
  static ParsedStoreMemo* memo = new ParsedStoreMemo;  // used until the very end
  return *memo;
}

struct StoreContents {
  enum class Status { Missing, Parsed, Corrupt, Unreadable } status = Status::Missing;
  int error = 0;
  InputBuffer bytes;           // none read when the memo's stamp held
  Ref<Dictionary> dictionary;  // immutable
};

StoreContents readStore(const std::string& path) {
  StoreContents contents;
  int fd = ::open(path.c_str(), O_RDONLY | O_CLOEXEC);
  struct stat st;
  if (fd >= 0 && ::fstat(fd, &st) != 0) {
    int error = errno;
    ::close(fd);
    fd = -1;
    errno = error;
  }
  if (fd < 0) {
    contents.error = errno;
    if (errno != ENOENT) {
      contents.status = StoreContents::Status::Unreadable;
      logOnce(
          path, "unreadable",
          "Cannot read the printing-preferences store " + path + ": " + errorText(contents.error));
    }
    return contents;
  }
  const FileStamp stamp = FileStamp::of(st);
  contents.dictionary = parsedStoreMemo().findByStamp(path, stamp);
  bool ok = contents.dictionary || contents.bytes.readAll(fd);
  contents.error = errno;
  ::close(fd);
  if (!ok) {
    contents.status = StoreContents::Status::Unreadable;
    logOnce(
        path, "unreadable",
        "Cannot read the printing-preferences store " + path + ": " + errorText(contents.error));
    return contents;
  }
  std::string_view bytes = contents.bytes.view();
  if (!contents.dictionary) contents.dictionary = parsedStoreMemo().findByBytes(path, bytes, stamp);
  if (!contents.dictionary) {
    contents.dictionary = cast<Dictionary>(readPropertyList(bytes));
    if (contents.dictionary) parsedStoreMemo().remember(path, bytes, stamp, contents.dictionary);
  }
  if (!contents.dictionary) {
    contents.status = StoreContents::Status::Corrupt;
    logOnce(path, "corrupt",
            "The printing-preferences store " + path +
                " is not a property-list dictionary; it reads as empty");
    return contents;
  }
  contents.status = StoreContents::Status::Parsed;
  return contents;
}

Ref<Object> readPreference(const String& key) {
  StoreContents contents = readStore(prefsStorePath());
  if (!contents.dictionary) return nullptr;
  return Ref<Object>(contents.dictionary->get(key));
}

// "<dir>/.<name>.XXXXXX": the temporary files of one store. Only a writer
// holding the lock makes them, so any found under the lock were left by a
// writer that died.
std::string temporaryPrefix(const std::string& target) {
  return directoryOf(target) + "/." + baseNameOf(target) + ".";
}

void removeStaleTemporaries(const std::string& store) {
  std::string dir = directoryOf(store);
  std::string prefix(1, '.');  // built by appending: GCC 12 misreads "." + name as overlapping
  prefix += baseNameOf(store);
  prefix += '.';
  DIR* d = ::opendir(dir.c_str());
  if (!d) return;
  while (dirent* entry = ::readdir(d)) {
    std::string_view name(entry->d_name);
    if (name.size() == prefix.size() + 6 && name.substr(0, prefix.size()) == prefix)
      ::unlinkat(::dirfd(d), entry->d_name, 0);
  }
  ::closedir(d);
}

bool syncDirectory(const std::string& dir) {
  int fd = ::open(dir.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (fd < 0) return false;
  bool ok = ::fsync(fd) == 0;
  ::close(fd);
  return ok;
}

// Writes the bytes to a new file in the target's directory, makes them
// durable, and renames the file over the target: a crash leaves the old or the
// new file, never a part of one. The directory is synced so the rename lasts.
bool replaceFile(const std::string& target, std::string_view bytes, mode_t mode) {
  std::string temporary = temporaryPrefix(target) + "XXXXXX";
  int fd = ::mkostemp(temporary.data(), O_CLOEXEC);
  if (fd < 0) {
    log("Cannot create a temporary file for %s: %s", target, errorText(errno));
    return false;
  }
  const char* failed = nullptr;
  if (::fchmod(fd, mode) != 0)
    failed = "set the mode of";
  else if (!writeAll(fd, bytes))
    failed = "write";
  else if (::fsync(fd) != 0)
    failed = "sync";
  int error = errno;
  if (::close(fd) != 0 && !failed) {
    failed = "close";
    error = errno;
  }
  if (!failed && ::rename(temporary.c_str(), target.c_str()) != 0) {
    failed = "rename";
    error = errno;
  }
  if (failed) {
    ::unlink(temporary.c_str());
    log("Cannot %s %s for %s: %s", failed, temporary, target, errorText(error));
    return false;
  }
  if (!syncDirectory(directoryOf(target)))
    log("Cannot sync the directory of %s: %s", target, errorText(errno));
  return true;
}

// The exclusive writer lock, held until destruction.
class StoreLock {
 public:
  explicit StoreLock(const std::string& store) {
    std::string path = store + ".lock";
    fd_ = ::open(path.c_str(), O_RDONLY | O_CREAT | O_CLOEXEC, kStoreMode);
    if (fd_ < 0) {
      log("Cannot open the lock file %s: %s", path, errorText(errno));
      return;
    }
    while (::flock(fd_, LOCK_EX) != 0) {
      if (errno == EINTR) continue;
      log("Cannot lock %s: %s", path, errorText(errno));
      ::close(fd_);
      fd_ = -1;
      return;
    }
  }
  ~StoreLock() {
    if (fd_ >= 0) ::close(fd_);  // closing the only descriptor releases the lock
  }
  StoreLock(const StoreLock&) = delete;
  StoreLock& operator=(const StoreLock&) = delete;
  bool held() const noexcept { return fd_ >= 0; }

 private:
  int fd_ = -1;
};

mode_t existingModeOr(const std::string& path, mode_t fallback) {
  struct stat st;
  if (::stat(path.c_str(), &st) != 0 || !S_ISREG(st.st_mode)) return fallback;
  return st.st_mode & 07777;
}

}  // namespace

std::string prefsStorePath() {
  const char* path = ::secure_getenv("CACHEWRIGHT_PREFS");
  if (path && *path) return path;
  return QUARRIN_PREFS_FILE;
}

Ref<String> copyStringPrintingPref(const String& key, int /*domain*/) {
  // Strings are immutable, so the parsed store's own serves as the caller's.
  return cast<String>(readPreference(key));
}

Ref<MutableDictionary> copyDictionaryPrintingPref(const String& key, int /*domain*/) {
  Ref<Dictionary> value = cast<Dictionary>(readPreference(key));
  if (!value) return nullptr;
  return cast<MutableDictionary>(deepCopy(*value, Mutability::MutableContainersAndLeaves));
}

Ref<Dictionary> storedDictionaryPrintingPref(const String& key, int /*domain*/) {
  return cast<Dictionary>(readPreference(key));
}

bool setPrintingPref(const String& key, const Object& value, int /*domain*/) {
  std::string store = prefsStorePath();
  std::string dir = directoryOf(store);
  if (!makeDirectories(dir)) {
    log("Cannot create the directory %s of the printing-preferences store: %s", dir,
        errorText(errno));
    return false;
  }
  StoreLock lock(store);
  if (!lock.held()) return false;
  removeStaleTemporaries(store);

  StoreContents current = readStore(store);
  // An equal value is already there: a rewrite would change nothing but
  // cost a sync of the whole file.
  if (current.status == StoreContents::Status::Parsed)
    if (Object* old = current.dictionary->get(key); old && old->isEqual(value)) return true;
  Ref<Object> stored = deepCopy(value, Mutability::Immutable);
  if (!stored) {
    log("Printing preference %@ not stored in %s: the value is not a property list", &key, store);
    return false;
  }
  Ref<MutableDictionary> dictionary;
  switch (current.status) {
    case StoreContents::Status::Unreadable:
      // Replacing a store that could not be read would lose what it holds.
      log("Printing preference %@ not stored: cannot read %s: %s", &key, store,
          errorText(current.error));
      return false;
    case StoreContents::Status::Corrupt: {
      std::string kept = store + ".corrupt";
      if (!replaceFile(kept, current.bytes.view(), kStoreMode)) return false;
      log("The unreadable printing-preferences store %s is kept as %s", store, kept);
      dictionary = make<MutableDictionary>();
      break;
    }
    case StoreContents::Status::Missing:
      dictionary = make<MutableDictionary>();
      break;
    case StoreContents::Status::Parsed:
      dictionary = current.dictionary->mutableCopy();
      break;
  }
  dictionary->set(key.copy(), std::move(stored));
  std::optional<std::string> xml = writeXMLPropertyList(*dictionary);
  if (!xml) {
    log("Printing preference %@ not stored: cannot write %s as a property list", &key, store);
    return false;
  }
  return replaceFile(store, *xml, existingModeOr(store, kStoreMode));
}

}  // namespace qr
