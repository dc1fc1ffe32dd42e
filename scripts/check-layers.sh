#!/usr/bin/env bash
# Fails when a file under src/ includes a folder above its own: the order is
# the README's layout, from the bottom up. Folders side by side (bundles,
# store, images) need nothing of each other either.
set -euo pipefail
cd "$(dirname "$0")/.."
order=(values platform plist bundles store images cache modules scanner hosts deviceid tool)
declare -A rank
for i in "${!order[@]}"; do rank[${order[$i]}]=$i; done
rank[store]=${rank[bundles]}
rank[images]=${rank[bundles]}
bad=0
while read -r file; do
  own=$(cut -d/ -f2 <<<"$file")
  [[ -n "${rank[$own]:-}" ]] || { echo "$file: folder $own has no place in the order"; bad=1; continue; }
  while read -r used; do
    [[ "$used" == "$own" ]] && continue
    if [[ -z "${rank[$used]:-}" || ${rank[$used]} -ge ${rank[$own]} ]]; then
      echo "$file includes $used/, which is not below $own/"
      bad=1
    fi
  done < <(grep -oE '^#include "[a-z_]+/' "$file" | sed -E 's/^#include "([a-z_]+)\//\1/' | sort -u)
done < <(git ls-files 'src/*.cc' 'src/*.h' 'src/*.c')
exit $bad
