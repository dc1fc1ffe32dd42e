// Module discovery over a tree of plug-in bundles laid out for each case.
#include "tool/discovery.h"

#include <gtest/gtest.h>
#include <quarrin/plugin.h>

#include <algorithm>
#include <filesystem>
#include <iterator>
#include <sstream>

#include "store/prefs_store.h"
#include "support/plugin_bundle.h"
#include "support/temp_dir.h"

using namespace qr;

namespace {

const char kFactory[] = "11111111-2222-3333-4444-555555555555";
const char kOther[] = "11111111-2222-3333-4444-666666666666";

// One item of a tree below root: "p:", "i:" or "b:" and a printer, I/O or
// browser module bundle (the I/O one also declares a printer factory); "f:"
// a plain file; "l:link=target" a symbolic link.
void lay(const std::string& root, const std::string& item) {
  std::string path = root + "/" + item.substr(2);
  if (item[0] == 'f') return qrtest::writeText(path, "plain");
  if (item[0] == 'l') {
    std::filesystem::path link = path.substr(0, path.find('='));
    std::filesystem::create_directories(link.parent_path());
    return std::filesystem::create_directory_symlink(root + "/" + path.substr(path.find('=') + 1),
                                                     link);
  }
  std::vector<qrtest::PluginDeclaration> types{
      {item[0] == 'b' ? QR_PBM_TYPE_ID : QR_PM_TYPE_ID, {kFactory}}};
  if (item[0] == 'i') types.push_back({QR_IOM_TYPE_ID, {kOther}});
  qrtest::writePluginBundle(path, types);
}

std::vector<std::string> words(const char* text) {
  std::istringstream in(text);
  return {std::istream_iterator<std::string>(in), {}};
}

TEST(Discovery, EachCaseFindsExactlyItsModules) {
  struct {
    const char* tree;   // items as lay() takes them
    const char* roots;  // below the case's directory
    const char* skip;   // excluded directories below it, and "*" patterns
    const char* found;  // "p:", "i:" or "b:" by host and the path, sorted
    int maxLevel = 200;
    const char* gate = "YES";
  } rows[] = {
      {"p:P/A.plugin p:P/A.plugin/Contents/PlugIns/B.plugin i:P/V/IO.plugin b:P/V/Br.plugin "
       "f:P/File.plugin p:P/NoInfo.plugin/Inner.plugin",
       "P", "", "b:P/V/Br.plugin i:P/V/IO.plugin p:P/A.plugin"},
      {"p:P/A.plugin", "P", "", "", 200, "yes"},
      {"p:P/Foo/A.plugin p:P/Foobar/B.plugin p:P/Old/C.plugin p:P/V/Old/D/E.plugin "
       "p:P/Older/F.plugin p:P/Skip/G.plugin",
       "P", "P/Foo */Old/* */Skip", "p:P/Foobar/B.plugin p:P/Older/F.plugin"},
      {"p:P/Foo/A.plugin", "P/Foo/", "P/Foo", "p:P/Foo/A.plugin"},
      {"p:E/Real.plugin p:P/Here.plugin l:P/Link.plugin=E/Real.plugin l:P/loop=P", "P", "",
       "p:P/Here.plugin p:P/Link.plugin"},
      {"p:E/V/In.plugin l:P/Vendor=E/V l:P/a/up=P l:P/dead=gone", "P", "", "p:P/Vendor/In.plugin"},
      {"p:P/A.plugin", "missing - P", "", "p:P/A.plugin"},  // "-": an empty root
      {"p:R/One.plugin p:R/a/Two.plugin p:R/a/b/Three.plugin", "R", "", "p:R/One.plugin", 2},
      {"p:R/One.plugin p:R/a/Two.plugin p:R/a/b/Three.plugin", "R", "",
       "p:R/One.plugin p:R/a/Two.plugin", 3},
      {"p:E/Real.plugin l:R/a/Link.plugin=E/Real.plugin", "R", "", "p:R/a/Link.plugin", 3},
      {"p:Root.plugin", "Root.plugin", "", "p:Root.plugin"},
      {"p:P/A.plugin", "", "", ""},  // no search settings at all
  };
  for (const auto& r : rows) {
    SCOPED_TRACE(r.tree);
    qrtest::TempDir dir;
    qrtest::EnvGuard env;
    env.set("CACHEWRIGHT_PREFS", dir / "prefs.plist");
    env.set("CACHEWRIGHT_FRAMEWORK", dir / "Z.framework");
    forgetDiscoverySettings();
    setPrintingPref(*String::make("support_quarrin"), *String::make(r.gate), 5);
    for (const auto& item : words(r.tree)) lay(dir.path(), item);
    std::string roots, excluded, patterns;
    for (const auto& path : words(r.roots))
      roots += "<string>" + (path == "-" ? "" : dir / path) + "</string>";
    for (const auto& path : words(r.skip))
      (path[0] == '*' ? patterns : excluded) +=
          "<string>" + (path[0] == '*' ? path : dir / path) + "</string>";
    if (*r.roots)
      dir.write("Z.framework/Resources/com.varnex.pm.xml",
                "<plist version=\"1.0\"><dict><key>PM Search Directories</key><array>" + roots +
                    "</array><key>PM Exclude Directories</key><array>" + excluded +
                    "</array><key>PM Exclude Matches</key><array>" + patterns +
                    "</array></dict></plist>");

    PMHost pm;
    IOMHost iom;
    PBMHost pbm;
    discoverModules(r.maxLevel, pm, iom, pbm);
    std::vector<std::string> found;
    for (auto [kind, host] : {std::pair<char, QuarrinHost*>{'p', &pm}, {'i', &iom}, {'b', &pbm}})
      host->loadedPlugins()->forEach([&](const Object& key, const Object&) {
        auto path = *static_cast<const URL&>(key).fileSystemPath();
        found.push_back(kind + (":" + path.substr(dir.path().size() + 1)));
      });
    std::sort(found.begin(), found.end());
    EXPECT_EQ(found, words(r.found));
  }
  forgetDiscoverySettings();
}

}  // namespace
