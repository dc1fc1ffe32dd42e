#!/usr/bin/env bash
# Builds the Debian packages (cachewright, libquarrin0, libquarrin-dev) from a
# scratch copy of the tree, since dpkg-buildpackage writes into debian/ and
# into the folder above the source; then runs lintian on them and lists the
# files of each package.
#
#   scripts/build-packages.sh [OUT_DIR]    default: a new folder under /tmp
set -euo pipefail
root=$(cd "$(dirname "$0")/.." && pwd)
out=${1:-$(mktemp -d /tmp/quarrin-packages.XXXXXX)}
out=$(mkdir -p "$out" && cd "$out" && pwd)
src=$out/quarrin
export DEBIAN_FRONTEND=noninteractive

missing=()
for p in dpkg-dev debhelper fakeroot lintian; do
  dpkg-query -W -f='${Status}' "$p" 2>/dev/null | grep -q "install ok installed" || missing+=("$p")
done
if ((${#missing[@]})); then
  apt-get update -q
  apt-get install -y -q --no-install-recommends "${missing[@]}"
fi

# The files git knows or would add, so no build folder comes along.
rm -rf "$src"
mkdir -p "$src"
git -C "$root" ls-files -z --cached --others --exclude-standard |
  tar -C "$root" --null -T - --ignore-failed-read -cf - | tar -C "$src" -xf -
cd "$src"
dpkg-checkbuilddeps 2>/dev/null || apt-get build-dep -y -q ./

echo "== building in $src"
start=$SECONDS
if ! dpkg-buildpackage -us -uc -b -j"$(nproc)" >"$out/build.log" 2>&1; then
  tail -n 40 "$out/build.log"
  echo "dpkg-buildpackage failed; the whole log is $out/build.log" >&2
  exit 1
fi
echo "built in $((SECONDS - start)) s (log: $out/build.log)"

changes=$(ls "$out"/quarrin_*.changes)
echo "== lintian"
lintian --display-info "$changes"
echo "lintian: no errors"

for deb in "$out"/*.deb; do
  echo "== ${deb##*/}"
  dpkg -c "$deb"
done
