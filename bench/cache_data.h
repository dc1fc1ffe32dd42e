// The cache-like dictionary the property-list benchmarks share: 10,000
// module entries keyed by module URL, each with a bundle version and eight
// connection types of two five-string browser-info dictionaries.
#pragma once

#include <cstdio>
#include <string>

#include "values/array.h"
#include "values/dictionary.h"
#include "values/string.h"

namespace qr::bench {

constexpr int kModules = 10000;
const char* const kConnectionTypes[] = {"USB", "DNSSD", "Quellnet",  "LPD",
                                        "IPP", "SMB",   "Bluetooth", "FireWire"};

inline std::string printf4(const char* format, int a) {
  char buf[64];
  std::snprintf(buf, sizeof buf, format, a);
  return buf;
}

// Two of the five strings repeat across entries (as printer kinds and makes
// do), three are unique, which is what gives the binary form its size.
inline Ref<Object> generateCache() {
  auto cache = make<MutableDictionary>();
  cache->reserve(kModules);
  for (int m = 1; m <= kModules; ++m) {
    std::string vendor = printf4("Vendor%04d", (m - 1) / 100 + 1);
    std::string module = printf4("%04d", m);
    auto entry = make<MutableDictionary>();
    entry->set("Bundle Version",
               String::make(std::to_string(m % 7) + "." + std::to_string(m % 13) + "." + module));
    for (const char* type : kConnectionTypes) {
      auto infos = make<MutableArray>();
      for (int i = 0; i < 2; ++i) {
        std::string unit = std::to_string(i);
        auto info = make<MutableDictionary>();
        info->set("Printer Browser Kind",
                  String::make(std::string(type) + " printer, class " + unit));
        info->set("Printer Browser Info",
                  String::make(vendor + " Module" + module + " " + type + " unit " + unit +
                               " status: idle, ready to print, queue empty"));
        info->set("Printer Browser DeviceID",
                  String::make("MFG:" + vendor + ";MDL:Model " + module + "-" + unit +
                               ";CMD:PCL,PJL,POSTSCRIPT,PDF,PWG-RASTER;CLS:PRINTER/" + type + ";"));
        info->set("Printer Make", String::make(vendor + " Imaging Systems"));
        info->set("Printer Model", String::make(vendor + " Model " + module + " " + type +
                                                " Series " + unit + " Duplex"));
        infos->append(info);
      }
      entry->set(type, infos);
    }
    cache->set(String::make("file:///usr/lib/quarrin/Printers/" + vendor + "/Module" + module +
                            ".plugin/"),
               entry);
  }
  return cache;
}

}  // namespace qr::bench
