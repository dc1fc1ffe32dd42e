#include "tool/cachewright.h"

#include <unistd.h>

#include <cstdio>
#include <memory>
#include <set>
#include <string>
#include <vector>

#include "bundles/bundle.h"
#include "cache/bundle_stamps.h"
#include "cache/failure_memory.h"
#include "cache/module_cache.h"
#include "modules/module_factory.h"
#include "platform/file_io.h"
#include "platform/log.h"
#include "plist/property_list.h"
#include "scanner/scanner_client.h"
#include "tool/discovery.h"
#include "values/dictionary.h"
#include "values/string.h"

namespace qr {

const char kCachewrightUsage[] =
    "Usage: cachewright [-s]\n"
    "    -s               Use stdin/stdout to read/write cache dictionary.\n";

namespace {

constexpr int kMaxDiscoveryDepth = 200;

// Path mode: exactly one word after the program name, and it begins with "/".
bool isPathMode(int argc, char** argv) { return argc == 2 && argv[1][0] == '/'; }

// Notes the host's modules as installed, and keeps their bundles' stamps.
void noteInstalled(const QuarrinHost& host, std::set<std::string>& urls) {
  for (const auto& key : host.loadedPlugins()->keys()) {
    if (auto* url = cast<URL>(key.get())) {
      urls.insert(url->absoluteString());
      BundleStamps::shared().keep(*url);
    }
  }
}

// Finds the installed modules and asks each what it offers; the answers land
// in the cache, and no lookup list is built, as nothing would read it. The
// hosts, and with them every module, go when this returns. Gives the URLs of
// the modules found. Each bundle is looked at once: its version cannot change
// between the questions of one run.
std::set<std::string> askModules() {
  BundleRunScope oncePerRun;
  auto pmHost = make<PMHost>();
  auto iomHost = make<IOMHost>();
  auto pbmHost = make<PBMHost>();
  QuarrinModuleFactory::resetLoadFailures();
  discoverModules(kMaxDiscoveryDepth, *pmHost, *iomHost, *pbmHost);
  for (const auto& item : *iomHost->connectionInfoList()) {
    auto* record = cast<ConnectionInfo>(item.get());
    if (record && record->connectionType()) pmHost->recordLookupInfo(*record->connectionType());
  }
  std::set<std::string> installed;
  for (const QuarrinHost* host :
       {static_cast<QuarrinHost*>(pmHost.get()), static_cast<QuarrinHost*>(iomHost.get()),
        static_cast<QuarrinHost*>(pbmHost.get())})
    noteInstalled(*host, installed);
  return installed;
}

// Serialises before opening the file, so a value that cannot be written
// never leaves a truncated file behind.
bool writeCacheFile(const char* path) {
  auto xml = writeXMLPropertyList(*QuarrinModuleCache::defaultCache().cacheDictionary());
  return xml && writeFile(path, *xml);
}

}  // namespace

int runCachewright(int argc, char** argv, bool isolatePlugins) {
  bool streamMode = false;
  for (int opt; (opt = getopt(argc, argv, "s?")) != -1;) {
    if (opt != 's') {
      fputs(kCachewrightUsage, stderr);
      return 1;
    }
    streamMode = true;
  }

  if (streamMode)
    QuarrinModuleCache::defaultCache().readFromFd(STDIN_FILENO);
  else if (isPathMode(argc, argv))
    QuarrinModuleCache::defaultCache().setCacheDict(make<MutableDictionary>());

  // Plug-in code runs in the helper: a plug-in that crashes or hangs loses
  // only its own answers. Path mode asks again the modules that failed before.
  if (isolatePlugins) PluginRunner::install(std::make_unique<ScannerClient>(scannerProgramPath()));
  if (isPathMode(argc, argv)) FailureMemory::shared().setConsulted(false);
  BundleStamps::shared().consult();
  std::set<std::string> installed = askModules();
  PluginRunner::install(nullptr);
  FailureMemory::shared().keepOnly(installed);
  FailureMemory::shared().save();
  // Stream mode leaves the store to the failure record alone.
  if (!streamMode) BundleStamps::shared().save();

  int status;
  if (streamMode) {
    status = 0;
    if (!QuarrinModuleCache::defaultCache().writeToFd(STDOUT_FILENO)) {
      // A truncated cache on standard output must not pass for a good one.
      log("Could not write the printer module cache to standard output.");
      status = 1;
    }
  } else {
    QuarrinModuleCache& cache = QuarrinModuleCache::defaultCache();
    // 1 says the cache was stored, so a store that failed must not end with it.
    status = cache.writeCache() ? 1 : cache.dirty() ? 2 : 0;
  }

  if (isPathMode(argc, argv) && String::fromUTF8(argv[1])) status = writeCacheFile(argv[1]) ? 0 : 1;
  return status;
}

}  // namespace qr
