#!/usr/bin/env bash
# The whole test suite: a normal build, then the same tests under
# AddressSanitizer and UndefinedBehaviorSanitizer, then the fuzz targets
# built with clang and run briefly over their seeds.
set -euo pipefail
cd "$(dirname "$0")/.."
scripts/install-deps.sh
jobs=$(nproc)

run_suite() {
  local dir=$1; shift
  cmake -S . -B "$dir" -G Ninja "$@" >/dev/null
  cmake --build "$dir" -j "$jobs"
  ctest --test-dir "$dir" -j "$jobs" --output-on-failure
}

echo "== include layers"
scripts/check-layers.sh
echo "== tests"
run_suite build/test -DCMAKE_BUILD_TYPE=RelWithDebInfo
echo "== tests under AddressSanitizer + UndefinedBehaviorSanitizer"
ASAN_OPTIONS=detect_leaks=1 UBSAN_OPTIONS=print_stacktrace=1 \
  run_suite build/sanitize -DCMAKE_BUILD_TYPE=Debug -DQUARRIN_SANITIZE=ON -DQUARRIN_BENCH=OFF
echo "== fuzz targets (short smoke run)"
scripts/fuzz.sh 15
echo "== Debian packages and lintian"
packages=$(mktemp -d /tmp/quarrin-packages.XXXXXX)
scripts/build-packages.sh "$packages"
rm -rf "$packages"
