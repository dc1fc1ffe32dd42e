// A plug-in bundle whose Info dictionary comes from the input, asked for its
// factories and instances the way the module layer asks. Contents/Linux stays
// empty, so no code is ever loaded: what is fuzzed is reading the declarations.
#include <stdlib.h>
#include <unistd.h>

#include <cstdint>
#include <filesystem>
#include <string>
#include <string_view>

#include "bundles/plugin_model.h"
#include "platform/file_io.h"
#include "platform/log.h"
#include "values/dictionary.h"
#include "values/string.h"

namespace {

const std::string& bundlePath() {
  static const std::string path = [] {
    std::string dir = (std::filesystem::temp_directory_path() / "quarrin-fuzz-XXXXXX").string();
    if (!mkdtemp(dir.data())) abort();
    std::filesystem::create_directories(dir + "/F.plugin/Contents/Linux");
    qr::setLogSink([](std::string_view) {});
    return dir + "/F.plugin";
  }();
  return path;
}

const char* const kKindTypes[] = {
    "EE5A5E5C-C2DD-11D3-84B5-00050209D9C1",
    "5D69ED5E-D5B5-11D3-9EFF-00050209D9C1",
    "23F71E46-95CC-1226-AC04-000502ADB00B",
};

void tryType(qr::PlugIn& plugin, const qr::UUID& type) {
  qr::Ref<qr::Array> factories = plugin.factoriesForType(type);
  if (!factories) return;
  for (const auto& factory : *factories) {
    auto* id = qr::cast<qr::UUID>(factory.get());
    if (!id || plugin.createInstance(*id, type)) abort();  // nothing can be loaded
  }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::string& path = bundlePath();
  std::string info = path + "/Contents/Info.plist";
  // Replaced by rename, so every input is a new file to the bundle cache.
  if (!qr::writeFile(info + ".new", std::string_view(reinterpret_cast<const char*>(data), size)) ||
      rename((info + ".new").c_str(), info.c_str()) != 0)
    abort();

  auto plugin = qr::PlugIn::create(*qr::URL::fileURL(path, true));
  if (!plugin) return 0;
  for (const char* text : kKindTypes) tryType(*plugin, *qr::UUID::fromString(text));
  // Every type the bundle declares, whatever it is.
  if (auto* types = plugin->bundle().infoDictionary()->getAs<qr::Dictionary>("CFPlugInTypes")) {
    for (const auto& key : types->keys()) {
      auto* text = qr::cast<qr::String>(key.get());
      if (!text) continue;
      if (auto type = qr::UUID::fromString(text->utf8())) tryType(*plugin, *type);
    }
  }
  return 0;
}
