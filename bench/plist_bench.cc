// Property-list throughput and memory on a cache-like dictionary: 10,000
// module entries keyed by module URL, each with a bundle version and eight
// connection types of two five-string browser-info dictionaries (about 94 MB
// as XML, 46 MB as binary, ours or plistlib's).
// Each operation runs in a forked child, which reports its time and its peak
// resident memory above what it started with (the input already loaded), so
// the figures of one operation never mix with another's. With libplist
// available, the same operations run through it on the same bytes for
// comparison; both libraries write a tree each read from the same XML.
// Arguments, if any, name the operations to run (by prefix).
#include <malloc.h>
#include <sys/wait.h>
#include <unistd.h>

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "cache_data.h"
#include "platform/file_io.h"
#include "plist/property_list.h"
#include "values/array.h"
#include "values/dictionary.h"
#include "values/string.h"

#ifdef QUARRIN_HAVE_LIBPLIST
#include <plist/plist.h>
#endif

using namespace qr;
using namespace qr::bench;

namespace {

constexpr int kRuns = 6;

long statusKiB(const char* field) {
  std::ifstream in("/proc/self/status");
  std::string line;
  size_t n = std::strlen(field);
  while (std::getline(in, line))
    if (line.compare(0, n, field) == 0) return std::atol(line.c_str() + n + 1);
  return -1;
}

struct Figure {
  bool ok = false;
  size_t bytes = 0;    // processed: input for reads, output for writes
  double cold = 0;     // seconds, first run in a fresh child
  double warm = 0;     // seconds, second run, on memory the first one freed
  double peakMiB = 0;  // of the first run
};

// Stopped by an operation before it checks and frees its result.
struct Stopwatch {
  std::chrono::steady_clock::time_point end;
  bool stopped = false;
  void stop() {
    end = std::chrono::steady_clock::now();
    stopped = true;
  }
};

// The operation returns the number of bytes it processed, or none on failure.
using Operation = std::function<std::optional<size_t>(Stopwatch&)>;

double timed(const Operation& op, std::optional<size_t>& bytes) {
  Stopwatch watch;
  auto t0 = std::chrono::steady_clock::now();
  bytes = op(watch);
  auto t1 = watch.stopped ? watch.end : std::chrono::steady_clock::now();
  return std::chrono::duration<double>(t1 - t0).count();
}

Figure runOnce(const Operation& op) {
  int fds[2];
  if (pipe(fds) != 0) return {};
  pid_t pid = fork();
  if (pid == 0) {
    close(fds[0]);
    // A fresh process's peak starts at its resident size at the fork.
    long base = statusKiB("VmRSS:");
    Figure f;
    std::optional<size_t> bytes;
    f.cold = timed(op, bytes);
    f.peakMiB = double(statusKiB("VmHWM:") - base) / 1024.0;
    f.ok = bytes.has_value();
    f.bytes = bytes.value_or(0);
    f.warm = timed(op, bytes);
    f.ok = f.ok && bytes.has_value();
    ssize_t written = write(fds[1], &f, sizeof f);
    _exit(written == sizeof f ? 0 : 1);
  }
  close(fds[1]);
  Figure f;
  if (read(fds[0], &f, sizeof f) != sizeof f) f.ok = false;
  close(fds[0]);
  waitpid(pid, nullptr, 0);
  return f;
}

// Folds one more run into the best times and the highest peak so far; one
// failed run fails the row.
void keepBest(Figure& best, bool& failed, const Figure& f) {
  if (failed || !f.ok) {
    failed = true;
    best.ok = false;
    return;
  }
  if (!best.ok) {
    best = f;
    return;
  }
  best.cold = std::min(best.cold, f.cold);
  best.warm = std::min(best.warm, f.warm);
  best.peakMiB = std::max(best.peakMiB, f.peakMiB);
}

double mbps(const Figure& f, double seconds) { return double(f.bytes) / 1e6 / seconds; }

std::string cells(const Figure* f) {
  char buf[64];
  if (!f || !f->ok)
    std::snprintf(buf, sizeof buf, "%9s %9s %9s", "n/a", "n/a", "n/a");
  else
    std::snprintf(buf, sizeof buf, "%9.1f %9.1f %9.1f", mbps(*f, f->cold), mbps(*f, f->warm),
                  f->peakMiB);
  return buf;
}

void row(const char* name, const Figure* ours, const Figure* theirs, const char* goal) {
  std::printf("%-19s %s   %s", name, cells(ours).c_str(), cells(theirs).c_str());
  if (ours && theirs && ours->ok && theirs->ok)
    std::printf("   %5.2fx %5.2fx %5.2fx  %s", theirs->cold / ours->cold, theirs->warm / ours->warm,
                ours->peakMiB / theirs->peakMiB, goal);
  std::printf("\n");
}

// The binary form of the XML file, made by Python's plistlib.
std::optional<std::string> binaryViaPython(const std::string& xmlPath) {
  std::string binPath = xmlPath + ".bin";
  pid_t pid = fork();
  if (pid == 0) {
    execlp("python3", "python3", "-c",
           "import plistlib, sys\n"
           "value = plistlib.load(open(sys.argv[1], 'rb'))\n"
           "open(sys.argv[2], 'wb').write(plistlib.dumps(value, fmt=plistlib.FMT_BINARY))\n",
           xmlPath.c_str(), binPath.c_str(), static_cast<char*>(nullptr));
    _exit(127);
  }
  int status = 0;
  waitpid(pid, &status, 0);
  auto bytes = readFile(binPath);
  unlink(binPath.c_str());
  if (!WIFEXITED(status) || WEXITSTATUS(status) != 0) return std::nullopt;
  return bytes;
}

bool wanted(const char* name, int argc, char** argv) {
  for (int i = 1; i < argc; ++i)
    if (std::strncmp(name, argv[i], std::strlen(argv[i])) == 0) return true;
  return argc < 2;
}

}  // namespace

int main(int argc, char** argv) {
  Ref<Object> cache = generateCache();
  std::string xml = *writeXMLPropertyList(*cache);

  char dir[] = "/tmp/plist-bench-XXXXXX";
  if (!mkdtemp(dir)) return 1;
  std::string xmlPath = std::string(dir) + "/cache.xml";
  writeFile(xmlPath, xml);
  std::optional<std::string> binary = binaryViaPython(xmlPath);
  unlink(xmlPath.c_str());
  rmdir(dir);

  std::printf("data: %d module entries, XML %.1f MB, our binary %.1f MB", kModules,
              double(xml.size()) / 1e6, double(writeBinaryPropertyList(*cache)->size()) / 1e6);
  if (binary)
    std::printf(", plistlib's binary %.1f MB\n", double(binary->size()) / 1e6);
  else
    std::printf("; no binary form: python3 with plistlib is not available\n");
  std::printf(
      "best of %d runs, each in a forked child: cold = its first run, on memory never\n"
      "touched before; warm = its second run, on the memory the first one freed;\n"
      "peak = resident memory of the first run above what the child started with\n\n",
      kRuns);

  auto readXML = [&](Mutability m) -> Operation {
    return [&, m](Stopwatch& watch) -> std::optional<size_t> {
      Ref<Object> v = readXMLPropertyList(xml, m);
      watch.stop();
      if (!v || !v->isEqual(*cache)) return std::nullopt;
      return xml.size();
    };
  };
  struct Row {
    Row(const char* n, const char* g, Operation o) : name(n), goal(g), ours(std::move(o)) {}
    const char* name;
    const char* goal;
    Operation ours;
    Operation theirs;  // empty without libplist
    Figure oursBest = {};
    Figure theirsBest = {};
    bool oursFailed = false;
    bool theirsFailed = false;
  };
  std::vector<Row> rows;
  rows.emplace_back("XML read", "(goal >= 3x, <= 135 MiB)", readXML(Mutability::Immutable));
  rows.emplace_back("XML read, mutable", "", readXML(Mutability::MutableContainersAndLeaves));
  if (binary)
    rows.emplace_back("binary read", "(goal >= 3x, <= 135 MiB)",
                      [&](Stopwatch& watch) -> std::optional<size_t> {
                        Ref<Object> v = readBinaryPropertyList(*binary, Mutability::Immutable);
                        watch.stop();
                        if (!v || !v->isEqual(*cache)) return std::nullopt;
                        return binary->size();
                      });
  // Written as libplist writes it: from a tree read from the XML, whose
  // nodes lie in the order a writer visits them. The tree built here in
  // random order costs more cache misses; its own row shows how many.
  Ref<Object> readTree = readXMLPropertyList(xml, Mutability::Immutable);
  auto writeXML = [&](const Object& tree) -> Operation {
    return [&](Stopwatch& watch) -> std::optional<size_t> {
      auto out = writeXMLPropertyList(tree);
      watch.stop();
      if (!out) return std::nullopt;
      return out->size();
    };
  };
  rows.emplace_back("XML write", "(goal >= 2x)", writeXML(*readTree));
  rows.emplace_back("binary write", "", [&](Stopwatch& watch) -> std::optional<size_t> {
    auto out = writeBinaryPropertyList(*readTree);
    watch.stop();
    if (!out) return std::nullopt;
    return out->size();
  });
  rows.emplace_back("XML write, built", "", writeXML(*cache));

#ifdef QUARRIN_HAVE_LIBPLIST
  auto named = [&](const char* name) -> Operation& {
    for (Row& r : rows)
      if (std::strcmp(r.name, name) == 0) return r.theirs;
    std::abort();
  };
  named("XML read") = named("XML read, mutable") = [&](Stopwatch& watch) -> std::optional<size_t> {
    plist_t p = nullptr;
    plist_from_xml(xml.data(), uint32_t(xml.size()), &p);
    watch.stop();
    if (!p) return std::nullopt;
    plist_free(p);
    return xml.size();
  };
  if (binary)
    named("binary read") = [&](Stopwatch& watch) -> std::optional<size_t> {
      plist_t p = nullptr;
      plist_from_bin(binary->data(), uint32_t(binary->size()), &p);
      watch.stop();
      if (!p) return std::nullopt;
      plist_free(p);
      return binary->size();
    };
  plist_t tree = nullptr;
  plist_from_xml(xml.data(), uint32_t(xml.size()), &tree);
  named("XML write") = [&](Stopwatch& watch) -> std::optional<size_t> {
    char* out = nullptr;
    uint32_t length = 0;
    plist_to_xml(tree, &out, &length);
    watch.stop();
    if (!out) return std::nullopt;
    plist_to_xml_free(out);
    return length;
  };
  named("binary write") = [&](Stopwatch& watch) -> std::optional<size_t> {
    char* out = nullptr;
    uint32_t length = 0;
    plist_to_bin(tree, &out, &length);
    watch.stop();
    if (!out) return std::nullopt;
    plist_to_bin_free(out);
    return length;
  };
#else
  std::printf("libplist: not built in (pkg-config libplist-2.0 found nothing)\n\n");
#endif

  std::erase_if(rows, [&](const Row& r) { return !wanted(r.name, argc, argv); });
  // Memory the set-up freed goes back to the system first: a child would
  // otherwise write into pages it shares with this process and pay a copy
  // for each, which is not what "cold" means.
  malloc_trim(0);

  // The two libraries' runs alternate, and which goes first alternates too:
  // a change in the machine's load, or memory just given back by the
  // previous child (cheaper to touch again in a virtual machine), then
  // falls on both alike.
  for (int round = 0; round < kRuns; ++round) {
    for (Row& row : rows) {
      bool oursFirst = round % 2 == 0;
      if (oursFirst) keepBest(row.oursBest, row.oursFailed, runOnce(row.ours));
      if (row.theirs) keepBest(row.theirsBest, row.theirsFailed, runOnce(row.theirs));
      if (!oursFirst) keepBest(row.oursBest, row.oursFailed, runOnce(row.ours));
    }
  }
#ifdef QUARRIN_HAVE_LIBPLIST
  plist_free(tree);
#endif

  std::printf("%-19s %29s   %29s   %20s\n", "", "------------ quarrin ---------",
              "----------- libplist ----------", "-- quarrin/libplist --");
  std::printf("%-19s %9s %9s %9s   %9s %9s %9s   %6s %6s %6s\n", "operation", "cold MB/s",
              "warm MB/s", "peak MiB", "cold MB/s", "warm MB/s", "peak MiB", "cold", "warm",
              "peak");
  for (const Row& r : rows) {
    row(r.name, &r.oursBest, r.theirs ? &r.theirsBest : nullptr, r.goal);
    if (!r.oursBest.ok) std::printf("  (%s gave no value equal to the data: n/a)\n", r.name);
  }
  if (!binary) std::printf("%-19s skipped: no binary form without python3\n", "binary read");
  return 0;
}
