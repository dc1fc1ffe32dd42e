#!/usr/bin/env bash
# Builds cachewright and the demo installation (examples/), then runs it:
# examples/run-demo.sh shows the cache a cold run builds, a warm run that
# loads no plug-in, and the connection records in display order.
set -euo pipefail
cd "$(dirname "$0")/.."
scripts/install-deps.sh
cmake -S . -B build/demo -G Ninja -DCMAKE_BUILD_TYPE=RelWithDebInfo >/dev/null
cmake --build build/demo -j "$(nproc)" --target quarrin_examples
examples/run-demo.sh build/demo
