#!/usr/bin/env bash
# How long reading takes: the same records by qntrace from their trace file and, exported to CTF, by babeltrace2. The
# programs take turns; what is printed are the medians over all rounds, and their ratios.
#
# usage: reading.sh BUILD-FOLDER [RECORDS [ROUNDS]]
set -euo pipefail
export LC_ALL=C
build=$1
records=${2:-1000000}
rounds=${3:-5}
qntrace=$build/tools/qntrace/qntrace
command -v babeltrace2 >/dev/null || { echo "babeltrace2 is not installed"; exit 0; }

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
"$build/bench/write_records" "$work/app.trc" "$records"
"$qntrace" export --to ctf -o "$work/ctf" "$work/app.trc"

# Both have read all of them, or the times mean nothing.
counted=$("$qntrace" stats --json --comp BNCH "$work/app.trc" | sed -n '1s/.*"records":\([0-9]*\).*/\1/p')
printed=$(babeltrace2 "$work/ctf" 2>/dev/null | grep -c 'comp = "BNCH"')
[ "$counted" = "$records" ] && [ "$printed" = "$records" ] ||
    { echo "of $records records qntrace counts $counted and babeltrace2 prints $printed" >&2; exit 1; }

names=("babeltrace2" "qntrace dump" "qntrace dump --json" "qntrace stats")
run() {
    case $1 in
    0) babeltrace2 "$work/ctf" ;;
    1) "$qntrace" dump "$work/app.trc" ;;
    2) "$qntrace" dump --json "$work/app.trc" ;;
    3) "$qntrace" stats "$work/app.trc" ;;
    esac >/dev/null 2>&1
}

for ((round = 0; round < rounds; ++round)); do
    for program in 0 1 2 3; do
        begin=${EPOCHREALTIME/./}
        run "$program"
        echo $((${EPOCHREALTIME/./} - begin)) >>"$work/us.$program"
    done
done

median() { sort -n "$work/us.$1" | sed -n "$(((rounds + 1) / 2))p"; }

reference=$(median 0)
printf '%d records, medians of %d rounds\n' "$records" "$rounds"
for program in 0 1 2 3; do
    us=$(median "$program")
    awk -v name="${names[$program]}" -v us="$us" -v reference="$reference" -v records="$records" 'BEGIN {
        printf "%-22s %8.1f ms %8.1f ns/record %8.3f of babeltrace2\n",
               name, us / 1000, us * 1000 / records, us / reference
    }'
done
