#include "tool/cachewright.h"

int main(int argc, char** argv) { return qr::runCachewright(argc, argv, true, true); }
