// The cachewright run: parse the command line, prepare the module cache, ask
// the installed modules, write the cache, and turn the outcome into the exit
// status.
#pragma once

namespace qr {

extern const char kCachewrightUsage[];

int runCachewright(int argc, char** argv);

}  // namespace qr
