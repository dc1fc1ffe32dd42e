// The whole "cachewright -s" round trip (read a cache on standard input,
// write it as XML to standard output) on the benchmark cache, in XML and in
// binary, against libplist doing the same in a process of its own: read the
// input, parse it, write XML, write that out. Best of several runs of each,
// alternating, in wall-clock and CPU time.
//
//   stream_bench [CACHEWRIGHT]   default: the one built with this bench
#include <fcntl.h>
#include <spawn.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <functional>
#include <string>

#include "cache_data.h"
#include "platform/file_io.h"
#include "plist/property_list.h"

#ifdef QUARRIN_HAVE_LIBPLIST
#include <plist/plist.h>
#endif

#ifndef QUARRIN_CACHEWRIGHT
#error "stream_bench needs the path of the cachewright program"
#endif

extern char** environ;

namespace {

constexpr int kRuns = 5;

struct Time {
  double wall = 1e9, cpu = 1e9;
};

double childrenCPU() {
  rusage u;
  getrusage(RUSAGE_CHILDREN, &u);
  return double(u.ru_utime.tv_sec + u.ru_stime.tv_sec) +
         double(u.ru_utime.tv_usec + u.ru_stime.tv_usec) / 1e6;
}

// Runs child (a process made by start) to its end; false when it failed.
bool timed(Time& best, const std::function<pid_t()>& start) {
  double cpu = childrenCPU();
  auto begin = std::chrono::steady_clock::now();
  pid_t pid = start();
  int status = 0;
  if (pid <= 0 || waitpid(pid, &status, 0) != pid) return false;
  double wall = std::chrono::duration<double>(std::chrono::steady_clock::now() - begin).count();
  best.wall = std::min(best.wall, wall);
  best.cpu = std::min(best.cpu, childrenCPU() - cpu);
  return WIFEXITED(status) && WEXITSTATUS(status) == 0;
}

const char* gProgram = QUARRIN_CACHEWRIGHT;

pid_t spawnCachewright(const std::string& input, const std::string& output) {
  posix_spawn_file_actions_t actions;
  posix_spawn_file_actions_init(&actions);
  posix_spawn_file_actions_addopen(&actions, 0, input.c_str(), O_RDONLY, 0);
  posix_spawn_file_actions_addopen(&actions, 1, output.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
  char option[] = "-s";
  char* argv[] = {const_cast<char*>(gProgram), option, nullptr};
  pid_t pid = 0;
  if (posix_spawn(&pid, gProgram, &actions, nullptr, argv, environ) != 0) pid = -1;
  posix_spawn_file_actions_destroy(&actions);
  return pid;
}

#ifdef QUARRIN_HAVE_LIBPLIST
pid_t forkLibplist(const std::string& input, const std::string& output) {
  pid_t pid = fork();
  if (pid != 0) return pid;
  auto bytes = qr::readFile(input);
  plist_t tree = nullptr;
  if (bytes) plist_from_memory(bytes->data(), uint32_t(bytes->size()), &tree);
  char* xml = nullptr;
  uint32_t length = 0;
  if (tree) plist_to_xml(tree, &xml, &length);
  int fd = open(output.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
  bool ok = xml && fd >= 0 && qr::writeAll(fd, std::string_view(xml, length));
  _exit(ok ? 0 : 1);  // a process about to end frees nothing
}
#endif

}  // namespace

int main(int argc, char** argv) {
  if (argc > 1) gProgram = argv[1];
  char dir[] = "/tmp/stream-bench-XXXXXX";
  if (!mkdtemp(dir)) return 1;
  const std::string root = dir;
  // A store without "support_quarrin": the run reads and writes the cache only.
  setenv("CACHEWRIGHT_PREFS", (root + "/prefs.plist").c_str(), 1);
  setenv("CACHEWRIGHT_FRAMEWORK", (root + "/none").c_str(), 1);
  qr::Ref<qr::Object> cache = qr::bench::generateCache();
  const std::string xml = root + "/cache.xml", binary = root + "/cache.bplist";
  const std::string out = root + "/out.xml";
  qr::writeFile(xml, *qr::writeXMLPropertyList(*cache));
  qr::writeFile(binary, *qr::writeBinaryPropertyList(*cache));

  std::printf("cachewright -s against libplist (read, parse, write XML, write out); best of %d\n",
              kRuns);
  std::printf("%-12s %9s %9s %11s %11s %9s %9s\n", "input", "MB", "ours ms", "ours cpu ms",
              "libplist ms", "lib cpu", "lib/ours");
  for (const auto& [name, path] : {std::pair{"XML", xml}, std::pair{"binary", binary}}) {
    Time ours, theirs;
    bool ok = true, theirsOk = true;
    for (int run = 0; run < kRuns; ++run) {
      ok = timed(ours, [&] { return spawnCachewright(path, out); }) && ok;
      if (run == 0) {
        auto written = qr::readPropertyListFile(out);
        ok = ok && written && written->isEqual(*cache);
      }
#ifdef QUARRIN_HAVE_LIBPLIST
      theirsOk = timed(theirs, [&] { return forkLibplist(path, out); }) && theirsOk;
#else
      theirsOk = false;
#endif
    }
    double mb = double(qr::readFile(path)->size()) / 1e6;
    std::printf("%-12s %9.1f %9.1f %11.1f", name, mb, ours.wall * 1e3, ours.cpu * 1e3);
    if (theirsOk)
      std::printf(" %11.1f %9.1f %8.2fx", theirs.wall * 1e3, theirs.cpu * 1e3,
                  theirs.wall / ours.wall);
    else
      std::printf(" %11s %9s %9s", "n/a", "n/a", "n/a");
    std::printf("%s  (goal >= 2.5x)\n", ok ? "" : "  (cachewright FAILED)");
  }
  for (const auto& path : {xml, binary, out, root + "/prefs.plist"}) unlink(path.c_str());
  rmdir(dir);
  return 0;
}
