// What the module cache pays per lookup for a bundle's short version: a
// fresh open that parses Info.plist, against an open answered from the
// process-wide bundle cache after one stat().
#include <fcntl.h>
#include <stdlib.h>
#include <sys/stat.h>

#include <chrono>
#include <cstdio>
#include <filesystem>
#include <string>
#include <vector>

#include "bundles/bundle.h"
#include "platform/file_io.h"
#include "plist/property_list.h"

namespace {

constexpr int kBundles = 300;
constexpr int kRounds = 20;

std::string infoPlist(int i) {
  std::string s =
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict>\n"
      "\t<key>CFBundleIdentifier</key>\n\t<string>com.example.module" +
      std::to_string(i) +
      "</string>\n\t<key>CFBundleShortVersionString</key>\n\t<string>1.0</string>\n"
      "\t<key>CFBundleExecutable</key>\n\t<string>module.so</string>\n"
      "\t<key>CFPlugInFactories</key>\n\t<dict>\n";
  for (int f = 0; f < 3; ++f)
    s += "\t\t<key>0B4F6C2E-1D7A-4B8E-9F3C-5A6B7C8D9E0" + std::to_string(f) +
         "</key>\n\t\t<string>Factory" + std::to_string(f) + "</string>\n";
  return s + "\t</dict>\n</dict>\n</plist>\n";
}

double secondsSince(std::chrono::steady_clock::time_point start) {
  return std::chrono::duration<double>(std::chrono::steady_clock::now() - start).count();
}

}  // namespace

int main() {
  std::string root = (std::filesystem::temp_directory_path() / "quarrin-bench-XXXXXX").string();
  if (!mkdtemp(root.data())) return 1;
  std::vector<std::string> paths;
  for (int i = 0; i < kBundles; ++i) {
    std::string bundle = root + "/M" + std::to_string(i) + ".plugin";
    std::filesystem::create_directories(bundle + "/Contents");
    std::string info = bundle + "/Contents/Info.plist";
    qr::writeFile(info, infoPlist(i));
    // An hour old, as installed plug-ins are: recent files are always re-read.
    struct timespec times[2];
    clock_gettime(CLOCK_REALTIME, &times[0]);
    times[0].tv_sec -= 3600;
    times[1] = times[0];
    utimensat(AT_FDCWD, info.c_str(), times, 0);
    paths.push_back(bundle);
  }

  size_t found = 0;
  auto start = std::chrono::steady_clock::now();
  for (int r = 0; r < kRounds; ++r)
    for (const auto& p : paths) {
      auto info = qr::cast<qr::Dictionary>(qr::readPropertyListFile(p + "/Contents/Info.plist"));
      found += info && info->get("CFBundleShortVersionString");
    }
  double parse = secondsSince(start) / (kRounds * kBundles);

  start = std::chrono::steady_clock::now();
  for (const auto& p : paths) found += qr::Bundle::open(p)->shortVersionString() != nullptr;
  double cold = secondsSince(start) / kBundles;

  start = std::chrono::steady_clock::now();
  for (int r = 0; r < kRounds; ++r)
    for (const auto& p : paths) found += qr::Bundle::open(p)->shortVersionString() != nullptr;
  double warm = secondsSince(start) / (kRounds * kBundles);

  std::printf("%d bundles, %zu versions found\n", kBundles, found);
  std::printf("read and parse Info.plist:     %8.2f us per lookup\n", parse * 1e6);
  std::printf("Bundle::open, first (cold):    %8.2f us per lookup\n", cold * 1e6);
  std::printf("Bundle::open, cached (warm):   %8.2f us per lookup\n", warm * 1e6);
  std::filesystem::remove_all(root);
  return 0;
}
