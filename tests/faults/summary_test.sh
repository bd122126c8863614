#!/usr/bin/env bash
# A test that fails makes the campaign fail, and stands in its table: run.sh and summary.py, with a ctest that says so.
#
#   summary_test.sh FOLDER_OF_RUN_SH
set -euo pipefail
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
mkdir -p "$work/tests/faults" "$work/docs" "$work/bin" "$work"/build/{release,asan,tsan}
cp "$1/run.sh" "$1/summary.py" "$work/tests/faults"
printf '# Comment\nAn attack: one finding\nAn attack: another one\n' >"$work/tests/faults/findings.txt"
printf 'before\n<!-- campaign: begin -->\nold\n<!-- campaign: end -->\nbehind\n' >"$work/docs/reliability.md"

# Counts a figure for one test, and reports it and another one, which counted nothing, as PLANTED says.
cat >"$work/bin/ctest" <<'CTEST'
#!/usr/bin/env bash
echo '{"test": "Some.Test", "item": "An attack", "what": "faults", "number": 1234}' >>"$QN_CAMPAIGN_RESULTS"
while [ "$1" != --output-junit ]; do shift; done
printf '<testsuite><testcase name="Some.Test" status="%s"/><testcase name="Died.Early" status="%s"/></testsuite>' \
    "$PLANTED" "$PLANTED" >"$2"
echo '100% tests passed'
[ "$PLANTED" = run ]
CTEST
chmod +x "$work/bin/ctest"

expect() {
    grep -qxF "$1" "$work/docs/reliability.md" && return
    echo "not in the table: $1"
    cat "$work/docs/reliability.md"
    exit 1
}

if PATH=$work/bin:$PATH PLANTED=fail "$work/tests/faults/run.sh" >/dev/null; then
    echo 'the campaign does not fail with its tests'
    exit 1
fi
expect '| An attack  | release |      0 |           1 234 |          0 |               2 |            1 |'
expect '| Died.Early | release |      0 |               0 |          0 |               0 |            1 |'
expect '| An attack  | tsan    |      0 |           1 234 |          0 |                 |            1 |'
expect before
expect behind

PATH=$work/bin:$PATH PLANTED=run "$work/tests/faults/run.sh" >/dev/null
expect '| An attack | release |      0 |           1 234 |          0 |               2 |            0 |'
