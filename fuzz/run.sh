#!/usr/bin/env bash
# Builds the fuzz targets with clang++ in build/fuzz and runs each of them for that many seconds (60).
#
#   fuzz/run.sh [SECONDS]
#
# What a target finds new it keeps in build/fuzz/found/<target>, so that the next run goes on from there; an input that
# fails is kept in build/fuzz/failed, and is run again by build/fuzz/fuzz_<target> FILE. An input that taught something is
# worth a place in fuzz/corpus/<target>, which the test suite runs too.
set -euo pipefail
cd "$(dirname "$0")/.."
seconds=${1:-60}
build=$PWD/build/fuzz

CC=${CC:-clang} CXX=${CXX:-clang++} cmake -S fuzz -B "$build" -G Ninja -DCMAKE_BUILD_TYPE=RelWithDebInfo >/dev/null
targets=(levels map sizes selection conf format reader start where)
cmake --build "$build" --target fuzz_planted "${targets[@]/#/fuzz_}" -- --quiet

# A configuration file has a language of its own, and lines of 1022 characters in it. Trace files have some kilobytes
# and no words, filter expressions a language too.
declare -A longest=([conf]=4096 [reader]=8192 [start]=4097)
declare -A words=([conf]=conf [format]=format [reader]=trace [start]=trace [where]=where)

mkdir -p "$build/failed"
if "$build/fuzz_planted" -max_total_time=60 -artifact_prefix="$build/planted-" >"$build/planted.log" 2>&1 ||
    ! grep -q 'the planted bug' "$build/planted.log"; then
    echo "a planted bug was not found, see $build/planted.log"
    exit 1
fi
status=0
for target in "${targets[@]}"; do
    mkdir -p "$build/found/$target"
    log=$build/$target.log
    if env -u QN_TR_FILENAME -u QN_TR_TRACE_LEVELS -u QN_TR_FILE_MAP -u QN_TR_FILE_SIZE \
        "$build/fuzz_$target" -max_total_time="$seconds" -timeout=60 -rss_limit_mb=2048 \
        -max_len="${longest[$target]:-512}" -dict="fuzz/${words[$target]:-specifications}.dict" \
        -print_final_stats=1 -artifact_prefix="$build/failed/$target-" \
        "$build/found/$target" "fuzz/corpus/$target" >"$log" 2>&1; then
        runs=$(sed -n 's/^stat::number_of_executed_units: *//p' "$log")
        printf '%-10s clean: %s inputs in %s s\n' "$target" "$runs" "$seconds"
    else
        status=1
        printf '%-10s FAILED, see %s:\n' "$target" "$log"
        tail -n 40 "$log"
    fi
done
exit $status
