#!/usr/bin/env bash
# The second act: treeindex writes far more than its live trace holds. Full pages are copied to a spool directory while
# it runs, and afterwards copies and live pages together hold every record that it wrote, once.
#
#   examples/demo_spool.sh build-folder
#
# The configuration file has a fixed place. So this starts itself again in a private mount namespace with an empty /var,
# and nothing of the machine is touched; where that is forbidden, QN_TR_SPOOL takes the file's place.
set -euo pipefail
build=$(realpath "$1")
source_of_configuration=${2:-}
treeindex=$build/examples/treeindex
qntrace=$build/tools/qntrace/qntrace

step() { printf '\n\033[1m== %s\033[0m\n' "$*"; }

if [ -z "$source_of_configuration" ]; then
    private=(unshare --mount)
    [ "$(id -u)" -eq 0 ] || private+=(--user --map-root-user)
    if [[ $build != /var/* ]] && "${private[@]}" mount -t tmpfs -o mode=0755 tmpfs /var 2>/dev/null; then
        exec "${private[@]}" "$0" "$build" file
    fi
    exec "$0" "$build" environment
fi

if [ "$source_of_configuration" = file ]; then
    mount -t tmpfs -o mode=0755 tmpfs /var
    folder=/var/treeindex
    spool_directories=() # those that the configuration file names
    mkdir -p "$folder" /var/qn/cfg
    cat >/var/qn/cfg/cluster.conf <<'TEXT'
cluster_name = demo
cluster_id = 6f2c
node_number = 1
node_id = 2a
TEXT
    cat >/var/qn/cfg/trace.conf <<TEXT
# The live trace of treeindex has 32 pages of 256 KiB; a page that is full is copied below dest.
treeindex:
    pat = .*/treeindex.trc
    spooling = ON
    pages = 32
    size = 262144
    dest = $folder/spool
TEXT
    step "what the configuration file means for spooling"
    "$qntrace" config
else
    step "no private mount namespace with a /var of its own here: QN_TR_SPOOL takes the place of the configuration file"
    folder=$(mktemp -d)
    spool_directories=("$folder/spool")
    trap 'rm -rf "$folder"' EXIT
    export QN_TR_SPOOL=".*/treeindex.trc:ON:32:$folder/spool"
    echo "QN_TR_SPOOL=$QN_TR_SPOOL"
fi

step "treeindex reads /usr/include 5 times, in detail, and its live trace holds 8 MiB"
QN_TR_TRACE_LEVELS='WALK:Queue=1,INDX:Content' \
    "$treeindex" -t "$folder/treeindex.trc" -r 5 /usr/include | tee "$folder/printed"
written=$(sed -n 's/ records traced$//p' "$folder/printed")

step "what its spool directory holds"
"$qntrace" spool "${spool_directories[@]}"

# A live page in the state "ready" was copied, or never written: whatever is in it is in a copy as well.
not_copied=()
for page in "$folder"/treeindex.trc.*.sp; do
    "$qntrace" info "$page" | grep -q '^page *ready$' || not_copied+=("$page")
done
mapfile -d '' copies < <(find "$folder/spool" -type f -print0)

step "the records of treeindex: ${#copies[@]} copies, and live pages that were not copied yet: ${#not_copied[@]}"
"$qntrace" dump --utc "${copies[@]}" "${not_copied[@]}" >"$folder/text"
grep -E '^[0-9]{4}-[^ ]+ +[0-9]+ +0x[0-9a-f]+ +(WALK|INDX) ' "$folder/text" >"$folder/records"
found=$(wc -l <"$folder/records")
different=$(sort -u "$folder/records" | wc -l)
printf '%10d written by treeindex\n%10d found\n%10d of them different\n' "$written" "$found" "$different"
if [ "$found" -ne "$written" ] || [ "$different" -ne "$written" ]; then
    echo "demo: copies and live pages do not hold every record once" >&2
    grep -E ' note +' "$folder/text" >&2 || true
    exit 1
fi
