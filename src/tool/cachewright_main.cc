#include "platform/short_run_memory.h"
#include "tool/cachewright.h"

int main(int argc, char** argv) {
  qr::tuneHeapForShortRun();
  return qr::runCachewright(argc, argv);
}
