// Bundles. The module cache asks a bundle's version at every lookup, so the
// parsed Info dictionary is kept process-wide per bundle path and trusted for
// as long as one stat() of the Info file shows it unchanged (see file_stamp.h).
// A bundle object holds an immutable snapshot; a changed file gives later
// opens a new snapshot and leaves the earlier ones as they were.
#include "bundles/bundle.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <list>
#include <mutex>
#include <unordered_map>

#include "platform/file_io.h"
#include "platform/file_stamp.h"
#include "plist/property_list.h"

namespace qr {
namespace {

// Bundles kept by the cache itself; beyond them, the least recently opened
// are kept only while some bundle object holds them.
constexpr size_t kMaxCachedBundles = 1024;
constexpr size_t kMaxStringsTables = 8;
// Info dictionaries and strings tables are small; a huge one is refused unread.
constexpr size_t kMaxPropertyListFileSize = 16u << 20;

// Where a bundle keeps its Info dictionary and resources, with the stamp of
// the Info file (none when there is none).
struct Layout {
  bool hasContents = false;
  std::string infoPath;
  std::optional<FileStamp> infoStamp;
};

// One stat() for the usual bundle with Contents/Info.plist; none when no
// directory exists at the path.
std::optional<Layout> probe(const std::string& dir) {
  Layout layout;
  layout.hasContents = true;
  layout.infoPath = dir + "/Contents/Info.plist";
  if ((layout.infoStamp = FileStamp::of(layout.infoPath))) return layout;
  if (!isDirectory(dir)) return std::nullopt;
  if (isDirectory(dir + "/Contents")) return layout;
  layout.hasContents = false;
  layout.infoPath = dir + "/Resources/Info.plist";
  layout.infoStamp = FileStamp::of(layout.infoPath);
  return layout;
}

// An absolute path without trailing slashes: the cache key of a bundle.
std::optional<std::string> normalizePath(const std::string& path) {
  if (path.empty() || path.find('\0') != std::string::npos) return std::nullopt;
  std::string result;
  if (path[0] != '/') {
    char* cwd = ::getcwd(nullptr, 0);
    if (!cwd) return std::nullopt;
    result = cwd;
    ::free(cwd);
    result += '/';
  }
  result += path;
  while (result.size() > 1 && result.back() == '/') result.pop_back();
  return result;
}

// A file or folder name that stays where it is put.
bool isPlainName(std::string_view name) {
  return !name.empty() && name.find_first_of(std::string_view("/\0", 2)) == std::string_view::npos;
}

String* stringValue(const Dictionary* dict, std::string_view key) {
  return dict ? dict->getAs<String>(key) : nullptr;
}

Ref<Dictionary> readDictionary(const std::string& bytes) {
  return cast<Dictionary>(readPropertyList(bytes));
}

}  // namespace

struct Bundle::State {
  std::string path;
  std::string resourcesPath;
  Layout layout;
  bool racy = false;
  Ref<Dictionary> info;
  Ref<String> identifier;
  Ref<String> shortVersion;
  std::string developmentRegion;

  // Strings tables read so far, by path, each trusted while its stamp holds.
  struct Table {
    FileStamp stamp;
    bool racy = false;
    Ref<Dictionary> dictionary;
  };
  mutable std::mutex tablesMutex;
  mutable std::unordered_map<std::string, Table> tables;

  bool isCurrent(const Layout& now) const {
    return !racy && layout.hasContents == now.hasContents && layout.infoStamp == now.infoStamp;
  }
  Ref<Dictionary> stringsTable(const std::string& tablePath) const;
};

namespace {

// The process-wide snapshots. The most recently opened ones are kept by the
// cache itself; any other is found for as long as some bundle object still
// holds it. So every bundle in use (a loaded module keeps its own) is found
// again after one stat(), however many there are, while the memory the
// cache keeps of its own stays bounded.
class BundleCache {
 public:
  using StatePtr = std::shared_ptr<const Bundle::State>;

  StatePtr find(const std::string& path, const Layout& layout) {
    std::lock_guard<std::mutex> lock(mutex_);
    auto it = entries_.find(path);
    if (it == entries_.end()) return nullptr;
    StatePtr state = it->second.kept ? it->second.kept : it->second.held.lock();
    if (!state || !state->isCurrent(layout)) return nullptr;
    keep(it, std::move(state));
    return it->second.kept;
  }

  void store(const std::string& path, StatePtr state) {
    std::lock_guard<std::mutex> lock(mutex_);
    auto it = entries_.try_emplace(path).first;
    keep(it, std::move(state));
    if (entries_.size() >= sweepAt_) sweep();
  }

  // The snapshot this process has of path, unchecked: for a run scope.
  StatePtr findAsSeen(const std::string& path) {
    std::lock_guard<std::mutex> lock(mutex_);
    auto it = entries_.find(path);
    if (it == entries_.end()) return nullptr;
    return it->second.kept ? it->second.kept : it->second.held.lock();
  }

  void remember(const std::string& path, const FileStamp& stamp, Ref<Dictionary> info) {
    std::lock_guard<std::mutex> lock(mutex_);
    remembered_.insert_or_assign(path, Remembered{stamp, std::move(info)});
  }

  // What an earlier process read from the Info file the layout found, if the
  // file still has the stamp it had then.
  Ref<Dictionary> rememberedInfo(const std::string& path, const Layout& layout) {
    if (!layout.hasContents || !layout.infoStamp) return nullptr;
    std::lock_guard<std::mutex> lock(mutex_);
    auto it = remembered_.find(path);
    if (it == remembered_.end() || !(it->second.stamp == *layout.infoStamp)) return nullptr;
    return it->second.info;
  }

  void forget(const std::string& path) {
    std::lock_guard<std::mutex> lock(mutex_);
    auto it = entries_.find(path);
    if (it == entries_.end()) return;
    if (it->second.kept) recent_.erase(it->second.position);
    entries_.erase(it);
  }

 private:
  struct Entry {
    std::weak_ptr<const Bundle::State> held;    // alive while any bundle object holds it
    StatePtr kept;                              // set while among the recent ones
    std::list<std::string>::iterator position;  // in recent_, while kept
  };
  using Iterator = std::unordered_map<std::string, Entry>::iterator;

  // Makes the entry the most recent, letting the least recent beyond the
  // limit go back to being merely held.
  void keep(Iterator it, StatePtr state) {
    Entry& entry = it->second;
    if (entry.kept) {
      recent_.splice(recent_.begin(), recent_, entry.position);
    } else {
      recent_.push_front(it->first);
      entry.position = recent_.begin();
    }
    entry.held = state;
    entry.kept = std::move(state);
    if (recent_.size() > kMaxCachedBundles) {
      entries_.find(recent_.back())->second.kept.reset();
      recent_.pop_back();
    }
  }

  // Drops the entries nobody holds any more; run when the table has doubled,
  // so its cost is spread over the stores that grew it.
  void sweep() {
    for (auto it = entries_.begin(); it != entries_.end();)
      it = !it->second.kept && it->second.held.expired() ? entries_.erase(it) : std::next(it);
    sweepAt_ = std::max(2 * entries_.size(), 2 * kMaxCachedBundles);
  }

  struct Remembered {
    FileStamp stamp;
    Ref<Dictionary> info;
  };

  std::mutex mutex_;
  std::unordered_map<std::string, Remembered> remembered_;
  std::list<std::string> recent_;  // most recent first
  std::unordered_map<std::string, Entry> entries_;
  size_t sweepAt_ = 2 * kMaxCachedBundles;
};

std::atomic<bool> gInRunScope{false};

BundleCache& bundleCache() {
  // Never destroyed: bundles may still be opened while static objects go.
  static BundleCache* cache = new BundleCache;
  return *cache;
}

void takeInfoKeys(Bundle::State& state) {
  const Dictionary* info = state.info.get();
  state.identifier = stringValue(info, "CFBundleIdentifier");
  state.shortVersion = stringValue(info, "CFBundleShortVersionString");
  if (String* region = stringValue(info, "CFBundleDevelopmentRegion"))
    state.developmentRegion = region->utf8();
}

// The snapshot of the bundle the layout describes; known is what an earlier
// process read from the same unchanged Info file, when there is one.
std::shared_ptr<const Bundle::State> loadState(const std::string& path, const Layout& layout,
                                               Ref<Dictionary> known) {
  auto state = std::make_shared<Bundle::State>();
  state->path = path;
  state->resourcesPath = path + (layout.hasContents ? "/Contents/Resources" : "/Resources");
  state->layout = layout;
  if (known) {
    state->info = std::move(known);
  } else if (layout.infoStamp) {
    StampedFile file = readStampedFile(layout.infoPath, kMaxPropertyListFileSize);
    // The stamp taken with the read describes the bytes parsed; an Info file
    // that cannot be opened keeps the probe's stamp and waits for a change.
    if (file.stamp) state->layout.infoStamp = file.stamp;
    if (file.bytes) state->info = readDictionary(*file.bytes);
    state->racy = state->layout.infoStamp->isRacy();
  }
  takeInfoKeys(*state);
  return state;
}

}  // namespace

Ref<Dictionary> Bundle::State::stringsTable(const std::string& tablePath) const {
  std::optional<FileStamp> now = FileStamp::of(tablePath);
  if (!now) return nullptr;
  {
    std::lock_guard<std::mutex> lock(tablesMutex);
    auto it = tables.find(tablePath);
    if (it != tables.end() && !it->second.racy && it->second.stamp == *now)
      return it->second.dictionary;
  }
  StampedFile file = readStampedFile(tablePath, kMaxPropertyListFileSize);
  if (!file.stamp) return nullptr;
  Table table;
  table.stamp = *file.stamp;
  table.racy = table.stamp.isRacy();
  if (file.bytes) table.dictionary = readDictionary(*file.bytes);
  std::lock_guard<std::mutex> lock(tablesMutex);
  // Only a few localizations are ever in use; a changed environment may
  // bring others, so the table list is simply started again when full.
  if (tables.size() >= kMaxStringsTables && !tables.count(tablePath)) tables.clear();
  return (tables[tablePath] = std::move(table)).dictionary;
}

Bundle::Bundle(std::shared_ptr<const State> state) : state_(std::move(state)) {}

Ref<Bundle> Bundle::open(const std::string& path) {
  std::optional<std::string> key = normalizePath(path);
  if (!key) return nullptr;
  BundleCache& cache = bundleCache();
  if (gInRunScope)
    if (std::shared_ptr<const State> seen = cache.findAsSeen(*key))
      return Ref<Bundle>::adopt(new Bundle(std::move(seen)));
  std::optional<Layout> layout = probe(*key);
  if (!layout) {
    cache.forget(*key);
    return nullptr;
  }
  std::shared_ptr<const State> state = cache.find(*key, *layout);
  if (!state) {
    state = loadState(*key, *layout, cache.rememberedInfo(*key, *layout));
    cache.store(*key, state);
  }
  return Ref<Bundle>::adopt(new Bundle(std::move(state)));
}

void Bundle::rememberInfo(const std::string& path, const FileStamp& stamp, Ref<Dictionary> info) {
  if (std::optional<std::string> key = normalizePath(path); key && info)
    bundleCache().remember(*key, stamp, std::move(info));
}

std::optional<FileStamp> Bundle::provenInfoStamp() const {
  const State& s = *state_;
  if (!s.layout.hasContents || !s.layout.infoStamp || s.racy || !s.info) return std::nullopt;
  return s.layout.infoStamp;
}

BundleRunScope::BundleRunScope() { gInRunScope = true; }
BundleRunScope::~BundleRunScope() { gInRunScope = false; }

Ref<Bundle> Bundle::withInfo(const std::string& path, Ref<Dictionary> info) {
  auto state = std::make_shared<Bundle::State>();
  state->path = path;
  state->resourcesPath = path + "/Contents/Resources";
  state->layout.hasContents = true;
  state->info = std::move(info);
  takeInfoKeys(*state);
  return Ref<Bundle>::adopt(new Bundle(std::move(state)));
}

Ref<Bundle> Bundle::open(const URL& url) {
  std::optional<std::string> path = url.fileSystemPath();
  if (!path) return nullptr;
  return open(*path);
}

const std::string& Bundle::path() const noexcept { return state_->path; }

Dictionary* Bundle::infoDictionary() const noexcept { return state_->info.get(); }

Object* Bundle::infoValue(std::string_view key) const noexcept {
  return state_->info ? state_->info->get(key) : nullptr;
}

String* Bundle::identifier() const noexcept { return state_->identifier.get(); }

String* Bundle::shortVersionString() const noexcept { return state_->shortVersion.get(); }

std::optional<std::string> Bundle::executablePath() const {
  String* executable = stringValue(state_->info.get(), "CFBundleExecutable");
  if (!executable) return std::nullopt;
  std::string name = executable->utf8();
  // The shared object must lie inside the bundle.
  if (!isPlainName(name) || name == "." || name == "..") return std::nullopt;
  return state_->path + "/Contents/Linux/" + name;
}

std::optional<std::string> Bundle::resourcePath(std::string_view name,
                                                std::string_view type) const {
  if (!isPlainName(name) || (!type.empty() && !isPlainName(type))) return std::nullopt;
  std::string file(name);
  if (!type.empty()) {
    file += '.';
    file += type;
  }
  for (const std::string& lproj : localizationOrder(state_->developmentRegion)) {
    std::string candidate = state_->resourcesPath + '/' + lproj + '/' + file;
    if (isReadableFile(candidate)) return candidate;
  }
  std::string candidate = state_->resourcesPath + '/' + file;
  if (isReadableFile(candidate)) return candidate;
  return std::nullopt;
}

Ref<String> Bundle::localizedString(const String& key, const Ref<String>& valueIfAbsent) const {
  std::optional<std::string> tablePath = resourcePath("Localizable", "strings");
  if (!tablePath) return valueIfAbsent;
  Ref<Dictionary> table = state_->stringsTable(*tablePath);
  String* value = table ? dynamic_cast<String*>(table->get(key)) : nullptr;
  return value ? Ref<String>(value) : valueIfAbsent;
}

}  // namespace qr
