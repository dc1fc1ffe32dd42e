#!/usr/bin/env bash
# Builds the libFuzzer targets with clang and runs each for the given number
# of seconds (default 600) over its seed corpus in fuzz/corpus/<target>.
set -euo pipefail
cd "$(dirname "$0")/.."
seconds=${1:-600}
dir=build/fuzz
CC=clang-14 CXX=clang++-14 cmake -S . -B "$dir" -G Ninja -DCMAKE_BUILD_TYPE=RelWithDebInfo \
  -DQUARRIN_FUZZ=ON -DBUILD_TESTING=OFF -DQUARRIN_BENCH=OFF >/dev/null
cmake --build "$dir" -j "$(nproc)"
shopt -s nullglob
for bin in "$dir"/fuzz/fuzz_*; do
  [ -x "$bin" ] || continue
  name=$(basename "$bin")
  work=build/fuzz-corpus/$name
  mkdir -p "$work"
  seeds=fuzz/corpus/$name
  [ -d "$seeds" ] || seeds=
  echo "-- $name for ${seconds}s"
  "$bin" -max_total_time="$seconds" -timeout=10 -rss_limit_mb=2048 -print_final_stats=1 \
    "$work" $seeds 2>&1 | tail -n 12
done
