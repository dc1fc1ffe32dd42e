// Bundles: directories with an Info dictionary, resources and localized
// strings tables (layout in the README of the bundle format).
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "platform/file_stamp.h"
#include "values/dictionary.h"
#include "values/object.h"
#include "values/string.h"
#include "values/url.h"

namespace qr {

class Bundle final : public Object {
 public:
  // Null when no directory exists at the path. Opening the same unchanged
  // bundle again is cheap: the parsed Info dictionary is kept per path and
  // read again only when the file changes.
  static Ref<Bundle> open(const std::string& path);
  static Ref<Bundle> open(const URL& url);
  // The bundle at path as someone who read its Info dictionary describes it
  // (a helper process, told by its parent): nothing is read from disk.
  static Ref<Bundle> withInfo(const std::string& path, Ref<Dictionary> info);

  const std::string& path() const noexcept;
  // The Info dictionary, or null when it is missing or unreadable.
  Dictionary* infoDictionary() const noexcept;
  Object* infoValue(std::string_view key) const noexcept;
  // CFBundleIdentifier and CFBundleShortVersionString, when they are strings.
  String* identifier() const noexcept;
  String* shortVersionString() const noexcept;
  // Contents/Linux/<CFBundleExecutable>, when the key is a string.
  std::optional<std::string> executablePath() const;
  // The file "<name>.<type>" in the current localization's .lproj folder, else
  // at the resources' top level; none when no such readable file exists.
  std::optional<std::string> resourcePath(std::string_view name, std::string_view type) const;
  // The value of key in Localizable.strings of the current localization, or
  // valueIfAbsent when the table or the key is missing.
  Ref<String> localizedString(const String& key, const Ref<String>& valueIfAbsent) const;

  // The stamp of the Info file this snapshot was read from, when a later
  // stat() showing the same stamp proves the file unchanged: none for a file
  // modified moments before it was read, or a bundle without Contents/Info.plist.
  std::optional<FileStamp> provenInfoStamp() const;
  // What an earlier process read from path's Contents/Info.plist when it had
  // this stamp. Later opens of path in this process take info instead of
  // reading the file, for as long as one stat() still shows that stamp.
  static void rememberInfo(const std::string& path, const FileStamp& stamp, Ref<Dictionary> info);

  // The parsed snapshot shared by every bundle object of one path and Info
  // file version (defined in bundle.cc, which keeps the process-wide cache).
  struct State;

 private:
  explicit Bundle(std::shared_ptr<const State> state);
  std::shared_ptr<const State> state_;
};

// While one exists, a bundle opened before in this process is opened again as
// it was then, without a stat(): one run of the tool sees each bundle once,
// however often it asks for its version. Not nested, not for other threads.
class BundleRunScope {
 public:
  BundleRunScope();
  ~BundleRunScope();
  BundleRunScope(const BundleRunScope&) = delete;
  BundleRunScope& operator=(const BundleRunScope&) = delete;
};

// The .lproj folder names to try, best first, from LANGUAGE, LC_ALL,
// LC_MESSAGES, LANG and the development region; then en, English, Base.
std::vector<std::string> localizationOrder(const std::string& developmentRegion);

}  // namespace qr
