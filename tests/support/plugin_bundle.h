// Plug-in bundle directories written by tests: an Info dictionary declaring
// factories per plug-in type, with or without a shared object behind it.
#pragma once

#include <string>
#include <vector>

#include "support/temp_dir.h"

namespace qrtest {

struct PluginDeclaration {
  std::string type;                    // plug-in type UUID text
  std::vector<std::string> factories;  // factory UUID texts, in order
};

inline void writePluginBundle(const std::string& path, const std::vector<PluginDeclaration>& types,
                              const std::string& version = "1.0",
                              const std::string& executable = "") {
  std::string xml =
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict>\n"
      "<key>CFBundleIdentifier</key><string>com.example.test</string>\n";
  if (!version.empty())
    xml += "<key>CFBundleShortVersionString</key><string>" + version + "</string>\n";
  if (!executable.empty())
    xml += "<key>CFBundleExecutable</key><string>" + executable + "</string>\n";
  xml += "<key>CFPlugInFactories</key><dict>\n";
  for (const auto& t : types)
    for (const auto& f : t.factories)
      xml += "<key>" + f + "</key><string>CreateInstance</string>\n";
  xml += "</dict>\n<key>CFPlugInTypes</key><dict>\n";
  for (const auto& t : types) {
    xml += "<key>" + t.type + "</key><array>";
    for (const auto& f : t.factories) xml += "<string>" + f + "</string>";
    xml += "</array>\n";
  }
  xml += "</dict>\n</dict>\n</plist>\n";
  writeText(path + "/Contents/Info.plist", xml);
}

}  // namespace qrtest
