#include "cache/failure_memory.h"

#include <sys/stat.h>

#include "platform/file_stamp.h"
#include "store/prefs_store.h"
#include "values/number.h"
#include "values/string.h"

namespace qr {
namespace {

constexpr std::string_view kFailuresPrefKey = "cachewright failures";
constexpr int kPrefDomain = 8;
constexpr std::string_view kFailureKey = "Failure";

Ref<String> keyOf(const URL& url) { return String::make(url.absoluteString()); }

}  // namespace

FailureMemory& FailureMemory::shared() {
  static FailureMemory* const memory = new FailureMemory;
  return *memory;
}

MutableDictionary& FailureMemory::entries() {
  if (!entries_)
    entries_ = copyDictionaryPrintingPref(*String::make(kFailuresPrefKey), kPrefDomain);
  if (!entries_) entries_ = make<MutableDictionary>();
  return *entries_;
}

// Everything that identifies this build of the plug-in, without the failure.
Ref<Dictionary> FailureMemory::describe(const PlugIn& plugin) {
  auto identity = make<MutableDictionary>();
  if (String* version = plugin.bundle().shortVersionString())
    identity->set("Bundle Version", Ref<String>(version));
  struct stat st;
  auto executable = plugin.bundle().executablePath();
  if (executable && ::stat(executable->c_str(), &st) == 0) {
    identity->set("Executable Modified", Number::integer(nanoseconds(st.st_mtim)));
    identity->set("Executable Size", Number::integer(int64_t(st.st_size)));
  }
  return identity;
}

std::optional<std::string> FailureMemory::standingFailure(const PlugIn& plugin) {
  if (!consulted_) return std::nullopt;
  auto* entry = cast<Dictionary>(entries().get(*keyOf(*plugin.url())));
  if (!entry) return std::nullopt;
  auto* what = entry->getAs<String>(kFailureKey);
  Ref<MutableDictionary> unchanged = describe(plugin)->mutableCopy();
  unchanged->set(kFailureKey, Ref<String>(what));
  if (!what || !unchanged->isEqual(*entry)) return std::nullopt;
  return what->utf8();
}

void FailureMemory::remember(const PlugIn& plugin, const std::string& what) {
  Ref<MutableDictionary> entry = describe(plugin)->mutableCopy();
  entry->set(kFailureKey, String::fromUTF8(what));
  entries().set(keyOf(*plugin.url()), entry);
  changed_ = true;
}

void FailureMemory::forget(const URL& module) {
  if (entries().remove(*keyOf(module))) changed_ = true;
}

void FailureMemory::keepOnly(const std::set<std::string>& installedURLs) {
  for (const auto& key : entries().keys()) {
    auto* url = cast<String>(key.get());
    if (url && installedURLs.count(url->utf8())) continue;
    entries().remove(*key);
    changed_ = true;
  }
}

bool FailureMemory::save() {
  if (!changed_) return true;
  if (!setPrintingPref(*String::make(kFailuresPrefKey), entries(), kPrefDomain)) return false;
  changed_ = false;
  return true;
}

}  // namespace qr
