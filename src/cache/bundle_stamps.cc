#include "cache/bundle_stamps.h"

#include "bundles/bundle.h"
#include "platform/file_stamp.h"
#include "store/prefs_store.h"
#include "values/number.h"

namespace qr {
namespace {

constexpr std::string_view kStampsPrefKey = "cachewright bundle stamps";
constexpr int kPrefDomain = 8;
constexpr std::string_view kInfoKey = "Info";

Ref<Dictionary> describe(const FileStamp& stamp, Dictionary& info) {
  auto entry = make<MutableDictionary>();
  entry->set("Device", Number::unsignedInteger(uint64_t(stamp.device)));
  entry->set("Inode", Number::unsignedInteger(uint64_t(stamp.inode)));
  entry->set("Size", Number::integer(int64_t(stamp.size)));
  entry->set("Mode", Number::integer(int64_t(stamp.mode)));
  entry->set("Modified", Number::integer(nanoseconds(stamp.modified)));
  entry->set("Changed", Number::integer(nanoseconds(stamp.changed)));
  entry->set(kInfoKey, Ref<Dictionary>(&info));
  return entry;
}

// Every field is needed: a record missing one matches no file.
std::optional<FileStamp> stampOf(const Dictionary& entry) {
  const char* const fields[] = {"Device", "Inode", "Size", "Mode", "Modified", "Changed"};
  Number* numbers[6];
  for (int i = 0; i < 6; ++i)
    if (!(numbers[i] = entry.getAs<Number>(fields[i])) || numbers[i]->isReal()) return std::nullopt;
  FileStamp stamp;
  stamp.device = dev_t(numbers[0]->uint64Value());
  stamp.inode = ino_t(numbers[1]->uint64Value());
  stamp.size = off_t(numbers[2]->int64Value());
  stamp.mode = mode_t(numbers[3]->int64Value());
  stamp.modified = fromNanoseconds(numbers[4]->int64Value());
  stamp.changed = fromNanoseconds(numbers[5]->int64Value());
  return stamp;
}

}  // namespace

BundleStamps& BundleStamps::shared() {
  static BundleStamps* const stamps = new BundleStamps;
  return *stamps;
}

void BundleStamps::consult() {
  stored_ = storedDictionaryPrintingPref(*String::make(kStampsPrefKey), kPrefDomain);
  if (!stored_) return;
  stored_->forEach([](const Object& key, const Object& value) {
    auto* path = cast<String>(const_cast<Object*>(&key));
    auto* entry = cast<Dictionary>(const_cast<Object*>(&value));
    Dictionary* info = entry ? entry->getAs<Dictionary>(kInfoKey) : nullptr;
    std::optional<FileStamp> stamp = entry ? stampOf(*entry) : std::nullopt;
    if (path && info && stamp) Bundle::rememberInfo(path->utf8(), *stamp, Ref<Dictionary>(info));
  });
}

void BundleStamps::keep(const URL& module) {
  std::optional<std::string> path = module.fileSystemPath();
  Ref<Bundle> bundle = path ? Bundle::open(*path) : nullptr;
  std::optional<FileStamp> stamp = bundle ? bundle->provenInfoStamp() : std::nullopt;
  if (!stamp) return;
  Dictionary* info = bundle->infoDictionary();
  // A bundle that took its Info dictionary from the stored record, under the
  // same stamp, keeps that record as it is.
  auto* record = stored_ ? stored_->getAs<Dictionary>(bundle->path()) : nullptr;
  if (record && record->get(kInfoKey) == info && stampOf(*record) == *stamp) {
    kept_->set(String::make(bundle->path()), Ref<Dictionary>(record));
    return;
  }
  kept_->set(String::make(bundle->path()), describe(*stamp, *info));
}

bool BundleStamps::save() {
  if (stored_ ? stored_->isEqual(*kept_) : kept_->isEmpty()) return true;
  if (!setPrintingPref(*String::make(kStampsPrefKey), *kept_, kPrefDomain)) return false;
  stored_ = kept_->copy();
  return true;
}

}  // namespace qr
