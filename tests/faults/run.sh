#!/usr/bin/env bash
# The fault campaign: runs the tests of the label "faults" with all their rounds in the release build, then with their
# few rounds under the sanitizers, and writes what was done into the table of docs/reliability.md.
#
#   tests/faults/run.sh
#
# `./dev build` of the presets release, asan and tsan is done by the caller. What a failed test wrote is in
# build/<preset>/campaign.log; the figures and the results are in campaign.jsonl and campaign.xml beside it.
set -euo pipefail
cd "$(dirname "$0")/../.."

status=0
for preset in release asan tsan; do
    build=$PWD/build/$preset
    results=$build/campaign.jsonl
    rm -f "$results" "$build/campaign.xml"
    whole=few
    if [ "$preset" = release ]; then whole=whole; fi
    printf '%s: ' "$preset"
    if QN_CAMPAIGN=$whole QN_CAMPAIGN_RESULTS=$results ctest --test-dir "$build" -L faults --output-on-failure \
        --parallel "$(nproc)" --timeout 3600 --output-junit "$build/campaign.xml" >"$build/campaign.log" 2>&1; then
        grep 'tests passed' "$build/campaign.log" || echo 'no tests'
    else
        status=1
        cat "$build/campaign.log"
    fi
done
tests/faults/summary.py docs/reliability.md build/release build/asan build/tsan
exit $status
