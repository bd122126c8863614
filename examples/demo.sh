#!/usr/bin/env bash
# Traces a real program and shows what it left behind: once when it ended well, once when it was killed, and once when
# it wrote far more than its live trace holds.
#
#   examples/demo.sh build-folder
set -euo pipefail
build=$1
folder=$(mktemp -d)
trap 'rm -rf "$folder"' EXIT
treeindex=$build/examples/treeindex
qntrace=$build/tools/qntrace/qntrace

step() { printf '\n\033[1m== %s\033[0m\n' "$*"; }

# Records per component and kind, from the reader's text: a record's line is time, sequence, thread, component, kind.
count_records() {
    awk '/^[0-9][0-9][0-9][0-9]-/ { count[$4 " " $5]++ }
         END { for (what in count) { split(what, part, " "); printf "  %-6s %-12s %8d\n", part[1], part[2], count[what] } }' \
        "$folder/text" | sort
}

show() {
    local status=0
    "$qntrace" dump "$1" >"$folder/text" 2>"$folder/messages" || status=$?
    tail -n 12 "$folder/text"
    cat "$folder/messages"
    printf '\nrecords in the trace (exit status of the reader: %d):\n' "$status"
    count_records
}

step "treeindex reads /usr/include with four threads, tracing into a ring of 1 MiB"
"$treeindex" -t "$folder/whole.trc" /usr/include /usr/include/no-such-folder
step "the end of its trace, decoded"
show "$folder/whole.trc"

step "again, with more detail asked for from outside, and the file names in a trace file of their own"
QN_TR_TRACE_LEVELS='WALK:Queue=1,INDX:Content' \
    "$treeindex" -t "$folder/detail.trc" -n "$folder/names.trc" /usr/include /usr/include/no-such-folder
step "the end of its trace, decoded"
show "$folder/detail.trc"
step "who wrote the names, and what is left of them in 64 KiB"
show "$folder/names.trc" | tail -n 6

step "again, killed with SIGKILL while its threads write"
"$treeindex" -t "$folder/killed.trc" -r 1000000 /usr/include /usr/include/no-such-folder &
program=$!
until [ -s "$folder/killed.trc" ]; do sleep 0.1; done
sleep 1
kill -KILL "$program"
wait "$program" 2>/dev/null || true
step "the trace that it left, decoded"
show "$folder/killed.trc"

"$(dirname "$0")/demo_spool.sh" "$build"
