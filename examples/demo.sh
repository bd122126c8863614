#!/usr/bin/env bash
# Traces a real program and shows what it left behind: once when it ended well, once when it was killed.
#
#   examples/demo.sh build-folder
set -euo pipefail
build=$1
folder=$(mktemp -d)
trap 'rm -rf "$folder"' EXIT
treeindex=$build/examples/treeindex
qntrace=$build/tools/qntrace/qntrace

step() { printf '\n\033[1m== %s\033[0m\n' "$*"; }

# Records per component and kind, from the reader's JSON lines.
count_records() {
    "$qntrace" dump --json "$1" 2>/dev/null |
        sed -n 's/.*"component":"\([^"]*\)".*"kind":"\([^"]*\)".*/\1 \2/p' | sort | uniq -c |
        awk '{ printf "  %-6s %-12s %8d\n", $2, $3, $1 }'
}

show() {
    local status=0
    "$qntrace" dump "$1" >"$folder/text" 2>"$folder/messages" || status=$?
    tail -n 12 "$folder/text"
    cat "$folder/messages"
    printf '\nrecords in the trace (exit status of the reader: %d):\n' "$status"
    count_records "$1"
}

step "treeindex reads /usr/include with four threads, tracing into a ring of 1 MiB"
"$treeindex" -t "$folder/whole.trc" /usr/include /usr/include/no-such-folder
step "the end of its trace, decoded"
show "$folder/whole.trc"

step "again, killed with SIGKILL while its threads write"
"$treeindex" -t "$folder/killed.trc" -r 1000000 /usr/include /usr/include/no-such-folder &
program=$!
until [ -s "$folder/killed.trc" ]; do sleep 0.1; done
sleep 1
kill -KILL "$program"
wait "$program" 2>/dev/null || true
step "the trace that it left, decoded"
show "$folder/killed.trc"
