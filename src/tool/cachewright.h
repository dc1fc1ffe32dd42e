// The cachewright run: parse the command line, prepare the module cache, ask
// the installed modules, write the cache, and turn the outcome into the exit
// status.
#pragma once

namespace qr {

extern const char kCachewrightUsage[];

// Plug-in code runs in the helper process unless isolatePlugins is false,
// which only a benchmark comparing the two should ask for.
int runCachewright(int argc, char** argv, bool isolatePlugins = true);

}  // namespace qr
