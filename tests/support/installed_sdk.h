// The build tree installed into a scratch prefix, the way a plug-in author's
// system holds it: made on first use, shared by the tests of one program and
// removed when the program ends.
#pragma once

#include <filesystem>
#include <string>

#include "support/run_program.h"

namespace qrtest {

struct InstalledSDK {
  std::string prefix;
  std::string pkgConfigPath;  // the folder of quarrin-plugin.pc; empty when the install failed
  std::string log;            // what cmake --install said
};

inline const InstalledSDK& installedSDK() {
  static TempDir dir;
  static const InstalledSDK sdk = [] {
    InstalledSDK s{dir / "prefix", "", ""};
    ProgramOptions o;
    o.args = {"--install", QUARRIN_BINARY_DIR, "--prefix", s.prefix};
    auto r = runProgram(QUARRIN_CMAKE_COMMAND, o);
    s.log = r.out + r.err;
    std::error_code ignored;
    if (r.status == 0)
      for (const auto& e : std::filesystem::recursive_directory_iterator(s.prefix, ignored))
        if (e.path().filename() == "quarrin-plugin.pc") s.pkgConfigPath = e.path().parent_path();
    return s;
  }();
  return sdk;
}

}  // namespace qrtest
