// The whole cachewright run over a synthetic installation of N printer
// modules (copies of the sample printer module's shared object, each bundle
// with its own Info dictionary, version and browser info) and 4 I/O modules:
//
//   cold   cachewright in path mode: an empty cache, every module loaded and asked
//          in the helper process, as every run does
//   inproc the same cold run with every plug-in called in the run's own
//          process, the way runs worked before the helper; both this and
//          "cold*" beside it are a forked copy of this program calling the
//          run, so that program start does not blur the comparison
//   warm   cachewright in default mode with every cache entry current: nothing loaded
//   floor  reading and parsing every bundle's Info dictionary once, in this
//          process: what a warm run, which must check every bundle's version,
//          cannot beat
//
// Each figure is the median of several runs, in wall-clock time and in CPU
// time (user and system), which a busy machine disturbs less. The runs are
// child processes, so cold and warm include starting the program; "start" is
// a run that has nothing to do (discovery switched off), for comparison.
//
//   run_bench [N ...]      default: 100 1000 5000
#include <fcntl.h>
#include <quarrin/plugin.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <functional>
#include <string>
#include <vector>

#include "platform/file_io.h"
#include "plist/property_list.h"
#include "tool/cachewright.h"
#include "values/dictionary.h"

#if !defined(QUARRIN_CACHEWRIGHT) || !defined(QUARRIN_SAMPLE_PRINTER_MODULE) || \
    !defined(QUARRIN_SAMPLE_IO_MODULES)
#error "run_bench is configured by examples/CMakeLists.txt, which builds the sample plug-ins"
#endif

namespace fs = std::filesystem;

namespace {

constexpr const char* kPMType = QR_PM_TYPE_ID;
constexpr const char* kIOMType = QR_IOM_TYPE_ID;

std::string infoPlist(const std::string& name, const std::string& version, const char* type,
                      const char* function) {
  const std::string factory = "6A1C2B3D-4E5F-4A6B-8C7D-9E0F1A2B3C4D";
  return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict>\n"
         "\t<key>CFBundleDevelopmentRegion</key>\n\t<string>en</string>\n"
         "\t<key>CFBundleExecutable</key>\n\t<string>" +
         name + ".so</string>\n\t<key>CFBundleIdentifier</key>\n\t<string>com.example.bench." +
         name + "</string>\n\t<key>CFBundleShortVersionString</key>\n\t<string>" + version +
         "</string>\n\t<key>CFPlugInFactories</key>\n\t<dict>\n\t\t<key>" + factory +
         "</key>\n\t\t<string>" + function +
         "</string>\n\t</dict>\n\t<key>CFPlugInTypes</key>\n\t<dict>\n\t\t<key>" + type +
         "</key>\n\t\t<array>\n\t\t\t<string>" + factory +
         "</string>\n\t\t</array>\n\t</dict>\n</dict>\n</plist>\n";
}

std::string browserEntry(int module, const std::string& model, const std::string& info) {
  std::string make = "Maker" + std::to_string(module % 37);
  return "\t\t<dict>\n\t\t\t<key>Printer Browser Kind</key>\n\t\t\t<string>" + make + " " + model +
         "</string>\n\t\t\t<key>Printer Browser Info</key>\n\t\t\t<string>" + info +
         "</string>\n\t\t\t<key>Printer Browser DeviceID</key>\n\t\t\t<string>MFG:" + make +
         ";MDL:" + model + ";CMD:PCL,PS;</string>\n\t\t</dict>\n";
}

// Two USB entries and one network entry per module.
std::string browserInfoPlist(int i) {
  std::string m = std::to_string(i);
  return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict>\n"
         "\t<key>USB</key>\n\t<array>\n" +
         browserEntry(i, "Model " + m + "A", "USB " + m + "A") +
         browserEntry(i, "Model " + m + "B", "USB " + m + "B") +
         "\t</array>\n\t<key>DNSSD</key>\n\t<array>\n" +
         browserEntry(i, "Model " + m + "B", "_printer._tcp") + "\t</array>\n</dict>\n</plist>\n";
}

// Installed plug-ins are not minutes old; files changed within the last
// moments are read again at every open, whatever their stamp says.
void makeOld(const std::string& path) {
  timespec times[2];
  clock_gettime(CLOCK_REALTIME, &times[0]);
  times[0].tv_sec -= 3600;
  times[1] = times[0];
  utimensat(AT_FDCWD, path.c_str(), times, 0);
}

struct Installation {
  std::string root;
  std::vector<std::string> infoPaths;  // every bundle's Info.plist
};

void addBundle(Installation& inst, const std::string& dir, const std::string& name,
               const std::string& version, const char* type, const char* function,
               const std::string& sharedObject) {
  std::string bundle = dir + "/" + name + ".plugin";
  fs::create_directories(bundle + "/Contents/Linux");
  fs::create_directories(bundle + "/Contents/Resources");
  fs::copy_file(sharedObject, bundle + "/Contents/Linux/" + name + ".so");
  std::string info = bundle + "/Contents/Info.plist";
  qr::writeFile(info, infoPlist(name, version, type, function));
  makeOld(info);
  inst.infoPaths.push_back(info);
}

Installation build(const std::string& root, int n) {
  Installation inst;
  inst.root = root;
  std::string printers = root + "/Printers";
  std::string ioModules = QUARRIN_SAMPLE_IO_MODULES;
  std::string usb = ioModules.substr(0, ioModules.find(':'));
  std::string dnssd = ioModules.substr(ioModules.find(':') + 1);
  for (int i = 0; i < 4; ++i)
    addBundle(inst, printers + "/IOModules", "IO" + std::to_string(i), "1.0", kIOMType,
              "SampleIOModuleFactory", i % 2 ? dnssd : usb);
  for (int i = 0; i < n; ++i) {
    std::string name = "PM" + std::to_string(i);
    // A few hundred modules to a folder, as vendors' folders hold them.
    std::string dir = printers + "/PrinterModules/Vendor" + std::to_string(i / 250);
    addBundle(inst, dir, name, "2." + std::to_string(i % 17) + "." + std::to_string(i), kPMType,
              "SamplePrinterModuleFactory", QUARRIN_SAMPLE_PRINTER_MODULE);
    std::string browserInfo = dir + "/" + name + ".plugin/Contents/Resources/BrowserInfo.plist";
    qr::writeFile(browserInfo, browserInfoPlist(i));
    makeOld(browserInfo);
  }
  fs::create_directories(root + "/Zephrin.framework/Resources");
  qr::writeFile(root + "/Zephrin.framework/Resources/com.varnex.pm.xml",
                "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n<dict>\n"
                "\t<key>PM Search Directories</key>\n\t<array>\n\t\t<string>" +
                    printers + "</string>\n\t</array>\n</dict>\n</plist>\n");
  return inst;
}

void writeStore(const std::string& path, bool discovery) {
  qr::writeFile(path, std::string("<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
                                  "<plist version=\"1.0\">\n<dict>\n"
                                  "\t<key>support_quarrin</key>\n\t<string>") +
                          (discovery ? "YES" : "NO") + "</string>\n</dict>\n</plist>\n");
}

double now() {
  return std::chrono::duration<double>(std::chrono::steady_clock::now().time_since_epoch()).count();
}

// CPU time (user and system) of the children waited for so far, and of this process.
double childrenCPU() {
  rusage usage;
  getrusage(RUSAGE_CHILDREN, &usage);
  return usage.ru_utime.tv_sec + usage.ru_stime.tv_sec +
         (usage.ru_utime.tv_usec + usage.ru_stime.tv_usec) / 1e6;
}
double ownCPU() {
  timespec t;
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &t);
  return t.tv_sec + t.tv_nsec / 1e9;
}

// Runs body(argv) in a child whose standard streams are /dev/null and errPath;
// its exit status, or -1.
int runChild(const std::vector<std::string>& args, const std::string& errPath,
             const std::function<int(int, char**)>& body) {
  pid_t pid = fork();
  if (pid == 0) {
    int null = open("/dev/null", O_RDWR);
    int err = open(errPath.c_str(), O_WRONLY | O_CREAT | O_APPEND, 0644);
    dup2(null, 0);
    dup2(null, 1);
    dup2(err, 2);
    std::vector<char*> argv{const_cast<char*>(QUARRIN_CACHEWRIGHT)};
    for (const auto& a : args) argv.push_back(const_cast<char*>(a.c_str()));
    argv.push_back(nullptr);
    _exit(body(int(argv.size()) - 1, argv.data()));
  }
  int status = 0;
  if (pid < 0 || waitpid(pid, &status, 0) != pid) return -1;
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

// cachewright itself, as installed programs run.
int runCachewright(const std::vector<std::string>& args, const std::string& errPath) {
  return runChild(args, errPath, [](int, char** argv) {
    execv(QUARRIN_CACHEWRIGHT, argv);
    return 127;
  });
}

// The run in a forked copy of this program, plug-ins in a helper or not.
int runForked(const std::vector<std::string>& args, bool isolate, const std::string& errPath) {
  return runChild(args, errPath, [isolate](int argc, char** argv) {
    return qr::runCachewright(argc, argv, isolate);
  });
}

double median(std::vector<double> v) {
  std::sort(v.begin(), v.end());
  return v.size() % 2 ? v[v.size() / 2] : (v[v.size() / 2 - 1] + v[v.size() / 2]) / 2;
}

// Median wall-clock and CPU time of several runs of body; cpu() reads the
// CPU clock that body's work shows on.
struct Times {
  double wall, cpu;
};
Times medianOf(int runs, double (*cpu)(), const std::function<void()>& body) {
  std::vector<double> wall, used;
  for (int r = 0; r < runs; ++r) {
    double start = now(), startCPU = cpu();
    body();
    wall.push_back(now() - start);
    used.push_back(cpu() - startCPU);
  }
  return {median(wall), median(used)};
}

bool fileIsEmpty(const std::string& path) {
  std::error_code ec;
  return !fs::exists(path, ec) || fs::file_size(path, ec) == 0;
}

// Something went wrong that makes the figures meaningless.
[[noreturn]] void fail(const std::string& what) {
  std::fprintf(stderr, "run_bench: %s\n", what.c_str());
  std::exit(1);
}

void measure(int n) {
  std::string root = (fs::temp_directory_path() / "quarrin-run-bench-XXXXXX").string();
  if (!mkdtemp(root.data())) fail("cannot make a temporary directory");
  Installation inst = build(root, n);
  std::string store = root + "/printing-prefs.plist";
  std::string cacheFile = root + "/cache.plist";
  std::string trace = root + "/loaded.txt";
  std::string errors = root + "/stderr.txt";
  setenv("CACHEWRIGHT_FRAMEWORK", (root + "/Zephrin.framework").c_str(), 1);
  setenv("CACHEWRIGHT_PREFS", store.c_str(), 1);
  setenv("QUARRIN_SAMPLE_TRACE", trace.c_str(), 1);
  std::string program = QUARRIN_CACHEWRIGHT;
  setenv("CACHEWRIGHT_SCANNER",
         (program.substr(0, program.rfind('/') + 1) + "cachewright-scanner").c_str(), 1);
  const int runs = n >= 5000 ? 3 : 5;

  writeStore(store, false);
  Times start = medianOf(runs, childrenCPU, [&] {
    if (runCachewright({}, errors) != 0) fail("the run without discovery did not exit with 0");
  });

  writeStore(store, true);
  Times cold = medianOf(runs, childrenCPU, [&] {
    if (runCachewright({cacheFile}, errors) != 0) fail("a cold run did not write its file");
  });
  auto cache = qr::cast<qr::Dictionary>(qr::readPropertyListFile(cacheFile));
  if (!cache || cache->count() != size_t(n) + 4)
    fail("the cold run's cache does not hold one entry per module");
  Times forked = medianOf(runs, childrenCPU, [&] {
    if (runForked({cacheFile}, true, errors) != 0) fail("a forked cold run did not write its file");
  });
  Times inProcess = medianOf(runs, childrenCPU, [&] {
    if (runForked({cacheFile}, false, errors) != 0)
      fail("an in-process run did not write its file");
  });
  auto same = qr::readPropertyListFile(cacheFile);
  if (!same || !same->isEqual(*cache)) fail("the in-process run's cache differs");

  fs::remove(trace);
  Times warm = medianOf(runs, childrenCPU, [&] {
    if (runCachewright({}, errors) != 1) fail("a warm run did not store the cache");
  });
  if (!fileIsEmpty(trace)) fail("a warm run loaded plug-in code");
  if (!fileIsEmpty(errors)) fail("cachewright logged something; see " + errors);

  Times floor = medianOf(runs, ownCPU, [&] {
    for (const auto& path : inst.infoPaths)
      if (!qr::readPropertyListFile(path)) fail("cannot read " + path);
  });

  for (auto [what, pick] : {std::pair{"wall", &Times::wall}, std::pair{"cpu", &Times::cpu}})
    std::printf("%6d %-4s %8.1f %9.1f %9.1f %9.1f %8.2f %9.1f %9.1f %9.1f %9.1f %9.1f %8.2f\n", n,
                what, start.*pick * 1e3, cold.*pick * 1e3, warm.*pick * 1e3, floor.*pick * 1e3,
                warm.*pick / (floor.*pick), cold.*pick / n * 1e6, warm.*pick / n * 1e6,
                floor.*pick / n * 1e6, forked.*pick * 1e3, inProcess.*pick * 1e3,
                forked.*pick / (inProcess.*pick));
  std::fflush(stdout);
  if (!getenv("KEEPROOT"))
    fs::remove_all(root);
  else
    std::printf("%s\n", root.c_str());
}

}  // namespace

int main(int argc, char** argv) {
  std::vector<int> sizes;
  for (int i = 1; i < argc; ++i) sizes.push_back(std::atoi(argv[i]));
  if (sizes.empty()) sizes = {100, 1000, 5000};
  std::printf("%6s %-4s %8s %9s %9s %9s %8s %9s %9s %9s %9s %9s %8s\n", "N", "time", "start ms",
              "cold ms", "warm ms", "floor ms", "warm/flr", "cold us/N", "warm us/N", "flr us/N",
              "cold* ms", "inproc ms", "cold*/in");
  for (int n : sizes) measure(n);
  return 0;
}
