#!/usr/bin/env bash
# Compares what each shared library exports with its version script, and its version script with the public headers.
#
#   exported_names.sh source-folder libqn_tr libqn_cu libqn_ffdc
set -euo pipefail
source=$1
failed=0

exported() { nm -D --defined-only "$1" | awk '$2 == "T" || $2 == "i" { sub(/@.*/, "", $3); print $3 }' | sort -u; }
listed() { sed -n '/global:/,/local:/p' "$1" | tr -d ' ;' | grep -v ':' | sort -u; }
declared() { grep -ohE '\b(tr|cu|fc)_[a-z0-9_]+ ?\(' "$@" | tr -d ' (' | sort -u; }

check() {
    local library=$1 script=$2
    shift 2
    if ! diff <(exported "$library") <(listed "$script"); then
        echo "$library does not export just what $script lists"
        failed=1
    fi
    local undocumented
    undocumented=$(comm -23 <(listed "$script") <(declared "$@"))
    if [ -n "$undocumented" ]; then
        printf 'in no header: %s\n' "$undocumented"
        failed=1
    fi
}

check "$2" "$source/trace/exports.map" "$source/include/qn_tr.h"
check "$3" "$(ls "$source"/platform/cu/*.map)" "$source/include/qn_cu.h" "$source/include/cu_tr_proxy.h"
check "$4" "$(ls "$source"/platform/ffdc/*.map)" "$source/include/qn_ffdc.h"
exit $failed
