#!/bin/sh
# Shows what `qntrace export --to chrome` makes of a trace to speedscope. Exits with 77 where that is not possible.
#
# usage: run.sh QNTRACE TRACE BUILD-FOLDER
set -eu
qntrace=$1 trace=$2 build=$3
here=$(cd "$(dirname "$0")" && pwd)

skip() {
    echo "skipped: $1"
    exit 77
}

command -v node >/dev/null && command -v npm >/dev/null || skip "there is no npm"
browser=$(command -v chromium) || skip "there is no chromium"

# The packages are installed anew when the list of them is another one.
mkdir -p "$build"
cp "$here/package.json" "$here/.npmrc" "$here/load.mjs" "$build"
if ! cmp -s "$here/package-lock.json" "$build/installed-lock.json"; then
    cp "$here/package-lock.json" "$build"
    (cd "$build" && npm ci --ignore-scripts >npm.log 2>&1) ||
        skip "npm cannot install speedscope: $(tail -n 3 "$build/npm.log")"
    cp "$here/package-lock.json" "$build/installed-lock.json"
fi

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
status=0
"$qntrace" export --to chrome -o "$work/profile.json" "$trace" 2>/dev/null || status=$?
[ "$status" -le 1 ] # 1: the trace has an unfinished record
HOME=$work node "$build/load.mjs" "$build/node_modules/speedscope/dist/release" "$work/profile.json" "$browser" \
    "$work/browser"
