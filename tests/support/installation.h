// A plug-in installation in a scratch directory: fixture bundles in one
// plug-in folder, a framework whose search settings name that folder, and a
// store with discovery switched on. cachewright runs over it.
#pragma once

#include <filesystem>
#include <map>
#include <regex>
#include <string>
#include <vector>

#include "fixtures/fixture_support.h"
#include "plist/property_list.h"
#include "support/run_program.h"
#include "values/dictionary.h"

namespace qrtest {

class Installation {
 public:
  explicit Installation(const std::vector<std::string>& fixtures) {
    std::filesystem::create_directories(printers_);
    for (const auto& name : fixtures) add(name);
    dir_.write("Z.framework/Resources/com.varnex.pm.xml",
               "<plist version=\"1.0\"><dict><key>PM Search Directories</key><array><string>" +
                   printers_ + "</string></array></dict></plist>");
    dir_.write("prefs.plist",
               "<plist version=\"1.0\"><dict><key>support_quarrin</key><string>YES</string>"
               "</dict></plist>");
  }

  void add(const std::string& fixture) {
    std::filesystem::copy(qr::test::fixtureBundle(fixture), bundle(fixture),
                          std::filesystem::copy_options::recursive);
  }
  void setVersion(const std::string& name, const std::string& version) const {
    std::string info = bundle(name) + "/Contents/Info.plist";
    writeText(info, std::regex_replace(readText(info),
                                       std::regex("(ShortVersionString</key>\\s*<string>)[^<]*"),
                                       "$01" + version));
  }
  std::string bundle(const std::string& name) const { return printers_ + "/" + name + ".plugin"; }
  // The module's key in the cache.
  std::string key(const std::string& name) const { return "file://" + bundle(name) + "/"; }
  const std::string& store() const { return store_; }
  const TempDir& dir() const { return dir_; }

  ProgramResult run(std::vector<std::string> args,
                    const std::map<std::string, std::string>& env = {}) const {
    ProgramOptions o;
    o.args = std::move(args);
    o.env = env;
    o.env["CACHEWRIGHT_FRAMEWORK"] = dir_ / "Z.framework";
    o.env["CACHEWRIGHT_PREFS"] = store_;
    return runProgram(QUARRIN_BINARY_DIR "/src/cachewright", o);
  }
  // A key of the store: "pmcache 5", "cachewright failures".
  qr::Ref<qr::Dictionary> stored(std::string_view key) const {
    auto prefs = qr::cast<qr::Dictionary>(qr::readPropertyListFile(store_));
    return qr::Ref<qr::Dictionary>(prefs ? prefs->getAs<qr::Dictionary>(key) : nullptr);
  }

 private:
  TempDir dir_;
  std::string printers_ = dir_ / "Printers", store_ = dir_ / "prefs.plist";
};

}  // namespace qrtest
