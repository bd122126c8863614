#!/usr/bin/env bash
# Installs into a scratch folder, compiles every header alone as C11 and C++17, builds a client with pkg-config and with
# CMake and runs it, and compiles and runs the client that README.md shows.
#
#   installed_client.sh build-folder c-compiler c++-compiler sanitizers
set -euo pipefail
here=$(cd "$(dirname "$0")" && pwd)
build=$1 cc=$2 cxx=$3 sanitize=$4
scratch=$(mktemp -d)
trap 'rm -rf "$scratch"' EXIT
prefix=$scratch/usr
flags=()
[ -z "$sanitize" ] || flags=("-fsanitize=$sanitize")

cmake --install "$build" --prefix "$prefix" >/dev/null
libdir=$(dirname "$(find "$prefix" -name libqn_tr.so)")
unset LD_LIBRARY_PATH
export PKG_CONFIG_PATH=$libdir/pkgconfig

for header in "$prefix"/include/*.h; do
    printf '#include <%s>\n' "$(basename "$header")" >"$scratch/alone.c"
    "$cc" -std=c11 -pedantic -Wall -Wextra -Werror -I"$prefix/include" -fsyntax-only "$scratch/alone.c"
    "$cxx" -x c++ -std=c++17 -pedantic -Wall -Wextra -Werror -I"$prefix/include" -fsyntax-only "$scratch/alone.c"
done

# pkg-config, as C and as C++
read -ra packaged < <(pkg-config --cflags --libs qn_tr)
"$cc" -std=c11 "${flags[@]}" "$here/client.c" "${packaged[@]}" -o "$scratch/client_c"
"$cxx" -x c++ "${flags[@]}" "$here/client.c" -x none "${packaged[@]}" -o "$scratch/client_cxx"

# CMake
mkdir "$scratch/project"
cp "$here/client.c" "$scratch/project"
cp "$here/CMakeLists.client.txt" "$scratch/project/CMakeLists.txt"
cmake -S "$scratch/project" -B "$scratch/project/build" -DCMAKE_PREFIX_PATH="$prefix" -DCMAKE_C_COMPILER="$cc" \
    -DCMAKE_C_FLAGS="${flags[*]}" >/dev/null
cmake --build "$scratch/project/build" >/dev/null

# README.md's client: the block between ```c and ```
sed -n '/^```c$/,/^```$/p' "$here/../../README.md" | sed '1d;$d' >"$scratch/readme.c"
[ -s "$scratch/readme.c" ]
"$cc" -std=c11 -Wall -Wextra -Werror "${flags[@]}" "$scratch/readme.c" "${packaged[@]}" -o "$scratch/readme"

for client in client_c client_cxx project/build/client readme; do
    LD_LIBRARY_PATH=$libdir "$scratch/$client" "$scratch/trace"
    "$prefix/bin/qntrace" dump "$scratch/trace" >"$scratch/text"
    grep -q client "$scratch/text"
    rm "$scratch/trace"
done

# README.md's configuration, in the environment, for the trace that its client names when it is given no name
pattern=$(sed -n 's/^ *pat = //p' "$here/../../README.md")
mkdir "$scratch/run"
(cd "$scratch/run" && QN_TR_SPOOL="$pattern:ON:4:$scratch/spool" LD_LIBRARY_PATH=$libdir "$scratch/readme")
test -s "$scratch/run/client.trc.1.sp"

# Folders that are absolute
cmake -DCMAKE_INSTALL_PREFIX=/opt/qn -DCMAKE_INSTALL_LIBDIR=/usr/lib/qn -DCMAKE_INSTALL_INCLUDEDIR=include \
    -DFILE="$scratch/absolute/qn_tr.pc" -P "$here/pkg_config_file.cmake"
[ "$(PKG_CONFIG_PATH=$scratch/absolute pkg-config --variable=libdir qn_tr)" = /usr/lib/qn ]
[ "$(PKG_CONFIG_PATH=$scratch/absolute pkg-config --variable=includedir qn_tr)" = /opt/qn/include ]

test -s "$prefix/share/man/man1/qntrace.1"
test -s "$prefix/share/man/man1/qntrace-dump.1"
test -s "$prefix/share/bash-completion/completions/qntrace"
test -s "$prefix/share/man/man5/trace.conf.5"
"$prefix/bin/qntrace" config "$prefix/share/doc/qn_tr/examples/trace.conf.sample" >/dev/null
test -s "$prefix/share/locale/C/LC_MESSAGES/qn_tr.cat"
echo "installed headers compile, four clients trace"
