#!/usr/bin/env bash
# Runs cachewright over the demo installation built in BUILD_DIR: a cold run,
# a path-mode run that writes the cache to a file, and a warm run; then lists
# the connection records in display order, in English and in German.
#
#   examples/run-demo.sh BUILD_DIR [WORK_DIR]
#
# The plug-ins and the framework are used where they were built; the
# preferences store is copied to WORK_DIR (a fresh temporary directory,
# removed afterwards, unless one is given), so the demo always starts cold.
set -euo pipefail

if [ $# -lt 1 ] || [ $# -gt 2 ]; then
  echo "usage: $0 BUILD_DIR [WORK_DIR]" >&2
  exit 2
fi
build=$(cd "$1" && pwd)
demo=$build/examples/demo
cachewright=$build/src/cachewright
list_connections=$build/examples/list_connections
for needed in "$demo/printing-prefs.plist" "$cachewright" "$list_connections"; do
  if [ ! -e "$needed" ]; then
    echo "$needed is missing: build $build first" >&2
    exit 2
  fi
done

if [ $# -eq 2 ]; then
  work=$2
  mkdir -p "$work"
else
  work=$(mktemp -d "${TMPDIR:-/tmp}/quarrin-demo.XXXXXX")
  trap 'rm -rf "$work"' EXIT
fi
store=$work/printing-prefs.plist
cache_file=$work/cache.plist
trace=$work/loaded.txt
cp "$demo/printing-prefs.plist" "$store"
rm -f "$cache_file"

# With no framework and no store, stream mode prints an empty cache.
echo '$ cachewright -s < /dev/null   (no framework, no store)'
status=0
CACHEWRIGHT_FRAMEWORK=$work/none CACHEWRIGHT_PREFS=$work/none/prefs.plist \
  "$cachewright" -s </dev/null 2>&1 || status=$?
echo "exit $status"
echo

export CACHEWRIGHT_FRAMEWORK=$demo/Zephrin.framework
export CACHEWRIGHT_PREFS=$store
# The sample plug-ins note here each time their code is loaded.
export QUARRIN_SAMPLE_TRACE=$trace

# The names of the plug-ins loaded since the trace was emptied, sorted.
loaded() {
  local names
  names=$(sort "$trace" | paste -sd ' ' -)
  echo "${names:-none}"
}

# Paths below the installation and the work directory, shortened for reading.
shorten() { sed -e "s|$demo|\$DEMO|g" -e "s|$work|\$WORK|g"; }

# run MEANING-OF-0 MEANING-OF-1 [ARG...]: one cachewright run, one line.
run() {
  local meaning0=$1 meaning1=$2 status meaning
  shift 2
  : >"$trace"
  set +e
  "$cachewright" "$@" 2>"$work/stderr.txt"
  status=$?
  set -e
  case $status in
    0) meaning=$meaning0 ;;
    1) meaning=$meaning1 ;;
    *) meaning="failed" ;;
  esac
  printf '$ %-29s exit %d (%s); plug-ins loaded: %s\n' "$(echo "cachewright $*" | shorten)" \
    "$status" "$meaning" "$(loaded)"
  sed 's/^/    log: /' "$work/stderr.txt" | shorten
}

echo "DEMO=$demo"
echo "WORK=$work (a copy of the preferences store, and the cache file)"
echo "Search settings: \$DEMO/Zephrin.framework/Resources/com.varnex.pm.xml"
echo "  (\$DEMO/Printers/PrinterModules/Retired is excluded there)"
echo
run "nothing stored" "cache stored"
run "file written" "file not written" "$cache_file"
cp "$store" "$work/store-before-warm-run.plist"
run "nothing stored" "cache stored"
if cmp -s "$store" "$work/store-before-warm-run.plist"; then
  echo "  (after the warm run the store holds the same cache as before)"
else
  echo "  (the warm run changed the stored cache)"
fi

echo
echo "BrokenExample.plugin is the example of a broken plug-in: it crashed in the helper"
echo "process that makes every call into plug-in code, so the run logged one line and"
echo "carried on. The modules with answers in the cache file:"
sed -n 's|^\t<key>\(file://.*\)</key>$|    \1|p' "$cache_file" | shorten
echo "The warm run skipped it: it is remembered under \"cachewright failures\" in the store"
echo "until it is rebuilt or its version changes."

echo
echo "The cache written to \$WORK/cache.plist:"
shorten <"$cache_file"

echo
echo "Connection records in display order (first-party browsers first, then by title):"
: >"$trace"
env -u LANGUAGE -u LC_ALL -u LC_MESSAGES LANG=C "$list_connections" | shorten
echo "  (plug-ins loaded for their titles: $(loaded))"
echo "The same with LANG=de_DE.UTF-8:"
env -u LANGUAGE -u LC_ALL -u LC_MESSAGES LANG=de_DE.UTF-8 "$list_connections" | shorten
