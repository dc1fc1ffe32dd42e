#!/usr/bin/env bash
# Builds everything and runs the demo installation.
set -euo pipefail
cd "$(dirname "$0")/.."
scripts/install-deps.sh
cmake -S . -B build/demo -G Ninja -DCMAKE_BUILD_TYPE=RelWithDebInfo >/dev/null
cmake --build build/demo -j "$(nproc)"
if [ -x examples/run-demo.sh ]; then
  examples/run-demo.sh build/demo
fi
