#!/usr/bin/env bash
# Installs the Debian packages the build, tests, fuzzers, benchmarks and man pages need.
set -euo pipefail
packages=(build-essential cmake ninja-build pkg-config clang-14 libclang-rt-14-dev
          libexpat1-dev libicu-dev libpng-dev libjpeg62-turbo-dev libtiff-dev
          libgtest-dev libgmock-dev libbenchmark-dev python3
          scdoc groff-base man-db)
missing=()
for p in "${packages[@]}"; do
  dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed" || missing+=("$p")
done
if ((${#missing[@]})); then
  echo "installing: ${missing[*]}"
  export DEBIAN_FRONTEND=noninteractive
  apt-get update -q
  apt-get install -y -q --no-install-recommends "${missing[@]}"
fi
