#!/usr/bin/env bash
# What the build does against those who make a program read hostile bytes: hardening.sh OPTIMISED FILE...
#
# OPTIMISED is 1 when the compiler optimises: only then can it put bounds into calls of the C library.
set -euo pipefail
optimised=$1
shift

for file in "$@"; do
    dynamic=$(readelf -dW "$file") segments=$(readelf -lW "$file") symbols=$(readelf -W --dyn-syms "$file")
    fail() {
        printf '%s: %s\n' "$file" "$1" >&2
        exit 1
    }
    # All addresses are resolved at the start, and read-only from then on.
    grep -q 'GNU_RELRO' <<<"$segments" || fail "no part of it is read-only after relocation"
    grep -q 'BIND_NOW' <<<"$dynamic" || fail "addresses are resolved as it runs"
    grep -qE 'GNU_STACK .* RW +0x' <<<"$segments" || fail "the stack is executable"
    grep -qE 'LOAD .* RWE' <<<"$segments" && fail "it has memory that is both written and executed"
    grep -q 'TEXTREL' <<<"$dynamic" && fail "its code is relocated"
    grep -qE 'RPATH' <<<"$dynamic" && fail "it names a folder to take libraries from"
    readelf -hW "$file" | grep -qE 'Type: +DYN' || fail "it is not position independent"
    grep -q '__stack_chk_fail' <<<"$symbols" || fail "stack frames are not guarded"
    # Threads, exit handlers and level bytes of clients outlive a dlclose().
    if [[ $file == *.so* ]]; then grep -q 'NODELETE' <<<"$dynamic" || fail "it can be unloaded"; fi
    if [ "$optimised" = 1 ]; then grep -qE '__[a-z]+_chk' <<<"$symbols" || fail "no call is bounded"; fi
done
echo "$# files are hardened"
