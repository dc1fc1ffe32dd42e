#include "tool/discovery.h"

#include <fnmatch.h>

#include <optional>
#include <string>
#include <vector>

#include "bundles/bundle.h"
#include "modules/io_module.h"
#include "modules/module_factory.h"
#include "modules/pbm_module.h"
#include "modules/pm_module.h"
#include "platform/directory_walk.h"
#include "platform/locations.h"
#include "plist/property_list.h"
#include "store/prefs_store.h"
#include "values/array.h"

namespace qr {
namespace {

std::optional<bool> gSupportGate;
Ref<Dictionary> gSearchSettings;

bool discoverySupported() {
  if (!gSupportGate) {
    Ref<String> value = copyStringPrintingPref(*String::make("support_quarrin"), 5);
    gSupportGate = value && value->equals("YES");
  }
  return *gSupportGate;
}

// The UTF-8 forms of the string elements of a settings array, in order.
std::vector<std::string> settingsList(const Dictionary& settings, std::string_view key) {
  std::vector<std::string> out;
  auto* array = settings.getAs<Array>(key);
  if (!array) return out;
  for (const auto& element : *array)
    if (auto* text = cast<String>(element.get())) out.push_back(text->utf8());
  return out;
}

// Hands a plug-in bundle to the factory and files the module with its host.
void registerBundle(const char* path, PMHost& pmHost, IOMHost& iomHost, PBMHost& pbmHost) {
  auto url = URL::fileURL(path, true);
  Ref<QuarrinModule> module = QuarrinModuleFactory::pluginForURL(url.get());
  if (cast<PMModule>(module.get()))
    pmHost.addPlugin(module, url.get());
  else if (cast<IOModule>(module.get()))
    iomHost.addPlugin(module, url.get());
  else if (cast<PBMModule>(module.get()))
    pbmHost.addPlugin(module, url.get());
}

}  // namespace

Dictionary* moduleSearchSettings() {
  if (gSearchSettings) return gSearchSettings.get();
  auto framework = Bundle::open(frameworkBundlePath());
  auto resource = framework ? framework->resourcePath("com.varnex.pm", "xml") : std::nullopt;
  if (!resource) {
    gSearchSettings = make<Dictionary>();
    return gSearchSettings.get();
  }
  // An unreadable resource is tried again at the next use.
  gSearchSettings = cast<Dictionary>(readPropertyListFile(*resource));
  return gSearchSettings.get();
}

void forgetDiscoverySettings() {
  gSupportGate.reset();
  gSearchSettings.reset();
}

void discoverModules(int maxLevel, PMHost& pmHost, IOMHost& iomHost, PBMHost& pbmHost) {
  if (!discoverySupported()) return;
  Dictionary* settings = moduleSearchSettings();
  if (!settings) return;
  std::vector<std::string> roots = settingsList(*settings, "PM Search Directories");
  if (roots.empty()) return;
  std::vector<std::string> excluded = settingsList(*settings, "PM Exclude Directories");
  std::vector<std::string> patterns = settingsList(*settings, "PM Exclude Matches");

  walkDirectories(roots, [&](const std::string& path, int level) {
    if (level >= maxLevel) return false;
    for (const auto& dir : excluded)
      if (dir == path) return false;
    for (const auto& pattern : patterns)
      if (fnmatch(pattern.c_str(), path.c_str(), 0) == 0) return false;
    if (fnmatch("*.plugin", path.c_str(), 0) != 0) return true;
    registerBundle(path.c_str(), pmHost, iomHost, pbmHost);
    // Plug-in bundles are never entered, so nested plug-ins are never found.
    return false;
  });
}

}  // namespace qr
