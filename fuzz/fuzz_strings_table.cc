// A bundle whose Info dictionary and default strings table come from the
// input (split at the first NUL byte), looked at the way the module layer does.
#include <stdlib.h>
#include <unistd.h>

#include <cstdint>
#include <filesystem>
#include <string>
#include <string_view>

#include "bundles/bundle.h"
#include "platform/file_io.h"
#include "values/string.h"

namespace {

const std::string& bundlePath() {
  static const std::string path = [] {
    std::string dir = (std::filesystem::temp_directory_path() / "quarrin-fuzz-XXXXXX").string();
    if (!mkdtemp(dir.data())) abort();
    std::filesystem::create_directories(dir + "/F.plugin/Contents/Resources/en.lproj");
    setenv("LANG", "C", 1);
    unsetenv("LANGUAGE");
    unsetenv("LC_ALL");
    unsetenv("LC_MESSAGES");
    return dir + "/F.plugin";
  }();
  return path;
}

// Replaced by rename, so every input is a new file to the bundle cache.
void replace(const std::string& path, std::string_view bytes) {
  std::string temporary = path + ".new";
  if (!qr::writeFile(temporary, bytes) || rename(temporary.c_str(), path.c_str()) != 0) abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  std::string_view input(reinterpret_cast<const char*>(data), size);
  size_t split = input.find('\0');
  std::string_view info = input.substr(0, split);
  std::string_view table = split == std::string_view::npos ? "" : input.substr(split + 1);
  const std::string& path = bundlePath();
  replace(path + "/Contents/Info.plist", info);
  replace(path + "/Contents/Resources/en.lproj/Localizable.strings", table);

  auto bundle = qr::Bundle::open(path);
  if (!bundle) abort();
  (void)bundle->shortVersionString();
  (void)bundle->executablePath();
  auto absent = qr::String::make("!identifier");
  if (qr::String* identifier = bundle->identifier())
    (void)bundle->localizedString(*identifier, absent);
  (void)bundle->localizedString(*qr::String::make("USB"), absent);
  return 0;
}
