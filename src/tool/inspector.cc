#include "tool/inspector.h"

#include <getopt.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "bundles/bundle.h"
#include "deviceid/device_id_json.h"
#include "images/image.h"
#include "modules/module_factory.h"
#include "platform/file_io.h"
#include "platform/file_trust.h"
#include "platform/log.h"
#include "scanner/scanner_client.h"
#include "store/prefs_store.h"
#include "values/data.h"
#include "values/exception.h"
#include "values/number.h"

namespace qr {

const char kInspectUsage[] =
    "Usage: quarrin-inspect [--json] [--type CONNECTION-TYPE]... BUNDLE...\n"
    "    --json           One JSON object per bundle per line.\n"
    "    --type TYPE      Ask printer modules for this connection type (repeatable).\n";

namespace {

struct Kind {
  const char* name;
  UUID* type;
  UUID* interface;
};

// What one bundle showed; printed as text or as one JSON line.
struct Report {
  std::string path, url;
  Ref<String> identifier, version, executable;
  std::vector<std::string> factories;  // "<uuid> -> <function>"
  std::vector<std::string> kinds;
  bool asked = false;  // an I/O module answered GetConnectionInfo
  Ref<String> connectionType, browserPath;
  int32_t status = 0;
  bool printerModule = false;
  std::vector<std::pair<std::string, Ref<Array>>> answers;  // per connection type
  std::vector<std::string> icons;                           // text only
  std::vector<std::string> problems;
};

std::string text(const Object* value) { return value ? describe(value) : "(none)"; }

// "crashed with SIGSEGV in CreateBrowserInfo" and the like.
std::string describeLoss(const PluginCallLost& lost) {
  if (lost.what.starts_with("SIG")) return "crashed with " + lost.what + " in " + lost.entry;
  if (lost.what.starts_with("exit status"))
    return "exited with status " + lost.what.substr(12) + " in " + lost.entry;
  return lost.what + " in " + lost.entry;
}

std::string hex(int32_t code) {
  char buffer[16];
  std::snprintf(buffer, sizeof buffer, "0x%08X", static_cast<uint32_t>(code));
  return buffer;
}

// The connection types the I/O modules recorded in the store's cache, else USB and DNSSD.
std::vector<std::string> recordedConnectionTypes() {
  std::vector<std::string> types;
  if (auto cache = copyDictionaryPrintingPref(*String::make("pmcache 5"), 8)) {
    cache->forEach([&](const Object&, const Object& entry) {
      auto* dict = dynamic_cast<const Dictionary*>(&entry);
      auto* type = dict ? dict->getAs<String>("kIOMConnectionType") : nullptr;
      if (type && std::find(types.begin(), types.end(), type->utf8()) == types.end())
        types.push_back(type->utf8());
    });
  }
  if (types.empty()) types = {"USB", "DNSSD"};
  return types;
}

class Inspector {
 public:
  explicit Inspector(std::vector<std::string> types)
      : types_(std::move(types)), client_(scannerProgramPath()) {}
  // False when the path is no bundle.
  bool inspect(const std::string& path, Report& report);

 private:
  void ask(PlugIn& plugin, const Kind& kind, Report& report);
  void checkAnswer(const Bundle& bundle, const std::string& type, const Array& answer,
                   Report& report);

  std::vector<std::string> types_;
  ScannerClient client_;
};

bool Inspector::inspect(const std::string& path, Report& report) {
  report.path = path;
  if (!isDirectory(path) || (!isReadableFile(path + "/Contents/Info.plist") &&
                             !isReadableFile(path + "/Resources/Info.plist")))
    return false;
  auto url = URL::fileURL(path, true);
  Ref<Bundle> bundle = url ? Bundle::open(*url) : nullptr;
  if (!bundle) return false;
  report.url = url->absoluteString();
  if (!bundle->infoDictionary()) {
    report.problems.push_back("the Info dictionary does not parse");
    return true;
  }
  report.identifier = bundle->identifier();
  report.version = bundle->shortVersionString();
  report.executable = Ref<String>(dynamic_cast<String*>(bundle->infoValue("CFBundleExecutable")));
  if (!report.version) report.problems.push_back("no short version (CFBundleShortVersionString)");
  if (auto* factories = dynamic_cast<Dictionary*>(bundle->infoValue("CFPlugInFactories")))
    factories->forEach([&](const Object& key, const Object& value) {
      report.factories.push_back(describe(&key) + " -> " + describe(&value));
    });

  Ref<PlugIn> plugin = PlugIn::create(*url, bundle);
  const Kind kinds[] = {
      {"iom", QuarrinModuleFactory::iomTypeID(), QuarrinModuleFactory::iomIntfID()},
      {"pm", QuarrinModuleFactory::pmTypeID(), QuarrinModuleFactory::pmIntfID()},
      {"pbm", QuarrinModuleFactory::pbmTypeID(), QuarrinModuleFactory::pbmIntfID()},
  };
  std::vector<const Kind*> declared;
  for (const Kind& kind : kinds) {
    Ref<Array> factories = plugin->factoriesForType(*kind.type);
    if (factories && !factories->isEmpty()) declared.push_back(&kind);
  }
  for (const Kind* kind : declared) report.kinds.push_back(kind->name);
  if (declared.empty()) {
    report.problems.push_back("declares no factory for an I/O, printer or browser module type");
    return true;
  }

  auto executable = bundle->executablePath();
  if (!executable) {
    report.problems.push_back("names no executable (CFBundleExecutable)");
    return true;
  }
  if (!isReadableFile(*executable)) {
    report.problems.push_back("the executable " + *executable + " does not exist");
    return true;
  }
  if (::geteuid() == 0) {
    if (auto problem = rootTrustProblem(bundle->path(), *executable)) {
      report.problems.push_back("unsafe permissions: '" + problem->path + "' is " +
                                problem->reason);
      return true;
    }
  }
  // What the helper logs while it loads the plug-in is a problem of this bundle.
  LogSink previous =
      setLogSink([&report](std::string_view line) { report.problems.emplace_back(line); });
  try {
    for (const Kind* kind : declared) ask(*plugin, *kind, report);
  } catch (const PluginCallLost& lost) {
    report.problems.push_back(describeLoss(lost));
  } catch (const Exception& e) {
    report.problems.push_back("cannot be asked: " + e.reason());
  }
  setLogSink(previous);
  return true;
}

void Inspector::ask(PlugIn& plugin, const Kind& kind, Report& report) {
  Ref<Array> factories = plugin.factoriesForType(*kind.type);
  auto* factory = cast<UUID>(factories->at(0));
  InterfaceLoad load =
      client_.loadInterface(plugin, *factory, *kind.type, *kind.interface, nullptr);
  std::string what = std::string("the ") + kind.name + " interface";
  if (load.raised) report.problems.push_back(what + ": raised " + *load.raised);
  if (load.releaseRaised) report.problems.push_back("Release raised " + *load.releaseRaised);
  if (!load.raised && !load.instanceMade)
    report.problems.push_back(what + ": the factory made no instance");
  if (load.instanceMade && !load.raised && load.queryResult < 0)
    report.problems.push_back(what + " cannot be had: QueryInterface returned " +
                              hex(load.queryResult));
  if (!load.interface) return;

  if (kind.type == QuarrinModuleFactory::iomTypeID()) {
    try {
      report.status =
          client_.getConnectionInfo(load.interface, &report.connectionType, &report.browserPath);
      report.asked = true;
      if (report.status != 0)
        report.problems.push_back("GetConnectionInfo returned status " +
                                  std::to_string(report.status));
    } catch (const Exception& e) {
      report.problems.push_back("GetConnectionInfo raised " + e.name());
    }
  } else if (kind.type == QuarrinModuleFactory::pmTypeID()) {
    report.printerModule = true;
    for (const auto& type : types_) {
      Ref<Array> answer;
      try {
        answer = client_.createBrowserInfo(load.interface, *String::make(type));
      } catch (const Exception& e) {
        report.problems.push_back("CreateBrowserInfo raised " + e.name() + " for " + type);
      }
      report.answers.emplace_back(type, answer);
      if (answer) checkAnswer(plugin.bundle(), type, *answer, report);
    }
  }
}

void Inspector::checkAnswer(const Bundle& bundle, const std::string& type, const Array& answer,
                            Report& report) {
  for (const auto& element : answer) {
    auto* entry = cast<Dictionary>(element.get());
    if (!entry) {
      report.problems.push_back("the answer for " + type + " is not an array of dictionaries");
      return;
    }
    std::string kindName = text(entry->get("Printer Browser Kind"));
    if (auto* icon = entry->getAs<Data>("Printer Browser Icons")) {
      bool ok = tiffRepresentationOfImageData(icon->view()) != nullptr;
      report.icons.push_back(type + ": " + kindName + ": embedded icon " +
                             (ok ? "decodes" : "does not decode"));
      if (!ok) report.problems.push_back("the icon embedded for " + kindName + " does not decode");
    } else if (auto* name = entry->getAs<String>("Printer Browser Icons Filename")) {
      std::string file = bundle.path() + "/Contents/Resources/PrinterIcons/" + name->utf8();
      const char* state = !isReadableFile(file)                            ? "not found"
                          : tiffRepresentationOfImageFile(file) == nullptr ? "does not decode"
                                                                           : "found";
      report.icons.push_back(type + ": " + kindName + ": icon " + name->utf8() + " " + state);
      if (std::strcmp(state, "found") != 0)
        report.problems.push_back("the icon " + name->utf8() + " named for " + kindName + " " +
                                  state);
    }
  }
}

void printText(const Report& r) {
  auto line = [](const char* label, const std::string& value) {
    std::printf("  %-13s%s\n", label, value.c_str());
  };
  std::printf("%s\n", r.path.c_str());
  line("identifier", text(r.identifier.get()));
  line("version", text(r.version.get()));
  line("executable", text(r.executable.get()));
  for (const auto& factory : r.factories) line("factory", factory);
  std::string kinds;
  for (const auto& kind : r.kinds) kinds += (kinds.empty() ? "" : ", ") + kind;
  line("kinds", kinds.empty() ? "(none)" : kinds);
  if (r.asked)
    line("I/O module", "connection type " + text(r.connectionType.get()) + ", browser " +
                           text(r.browserPath.get()) + ", status " + std::to_string(r.status));
  for (const auto& [type, answer] : r.answers)
    line(("asked " + type).c_str(),
         !answer                ? "no answer"
         : answer->count() == 1 ? "1 browser info entry"
                                : std::to_string(answer->count()) + " browser info entries");
  for (const auto& icon : r.icons) line("icon", icon);
  if (r.problems.empty()) line("problems", "no problems found");
  for (size_t i = 0; i < r.problems.size(); ++i) line(i ? "" : "problems", r.problems[i]);
}

void printJSON(const Report& r) {
  std::string out = "{\"path\":";
  deviceid::appendJSONString(out, *String::make(r.path));
  out += ",\"url\":";
  deviceid::appendJSONValue(out, r.url.empty() ? nullptr : String::make(r.url).get());
  out += ",\"identifier\":";
  deviceid::appendJSONValue(out, r.identifier.get());
  out += ",\"version\":";
  deviceid::appendJSONValue(out, r.version.get());
  out += ",\"executable\":";
  deviceid::appendJSONValue(out, r.executable.get());
  out += ",\"kinds\":[";
  for (size_t i = 0; i < r.kinds.size(); ++i) out += (i ? ",\"" : "\"") + r.kinds[i] + "\"";
  out += "],\"iom\":";
  if (r.asked) {
    out += "{\"connectionType\":";
    deviceid::appendJSONValue(out, r.connectionType.get());
    out += ",\"browserPath\":";
    deviceid::appendJSONValue(out, r.browserPath.get());
    out += ",\"status\":" + std::to_string(r.status) + "}";
  } else {
    out += "null";
  }
  out += ",\"pm\":";
  if (r.printerModule) {
    out += "{";
    for (size_t i = 0; i < r.answers.size(); ++i) {
      if (i) out += ",";
      deviceid::appendJSONString(out, *String::make(r.answers[i].first));
      out += ":";
      deviceid::appendJSONValue(out, r.answers[i].second.get());
    }
    out += "}";
  } else {
    out += "null";
  }
  out += ",\"problems\":[";
  for (size_t i = 0; i < r.problems.size(); ++i) {
    if (i) out += ",";
    deviceid::appendJSONString(out, *String::make(r.problems[i]));
  }
  out += "]}\n";
  std::fputs(out.c_str(), stdout);
}

}  // namespace

int runInspect(int argc, char** argv) {
  bool json = false;
  std::vector<std::string> types;
  static const option kOptions[] = {
      {"json", no_argument, nullptr, 'j'}, {"type", required_argument, nullptr, 't'}, {}};
  for (int opt; (opt = getopt_long(argc, argv, "", kOptions, nullptr)) != -1;) {
    if (opt == 'j') {
      json = true;
    } else if (opt == 't' && *optarg) {
      types.push_back(optarg);
    } else {
      std::fputs(kInspectUsage, stderr);
      return 2;
    }
  }
  if (optind == argc) {
    std::fputs(kInspectUsage, stderr);
    return 2;
  }
  if (types.empty()) types = recordedConnectionTypes();

  Inspector inspector(types);
  int status = 0;
  for (int i = optind; i < argc; ++i) {
    Report report;
    if (!inspector.inspect(argv[i], report)) {
      std::fprintf(stderr, "quarrin-inspect: %s is not a bundle\n", argv[i]);
      status = 2;
      continue;
    }
    json ? printJSON(report) : printText(report);
    if (!json && i + 1 < argc) std::putchar('\n');
    if (!report.problems.empty() && status == 0) status = 1;
  }
  std::fflush(stdout);
  return status;
}

}  // namespace qr
