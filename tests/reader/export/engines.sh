#!/bin/sh
# Loads exported JSON lines into ClickHouse and into Dask's distributed scheduler, and compares what they count with what
# `qntrace stats` counts. Not one of the fast tests: it needs the packages
#
#   apt-get install clickhouse-server clickhouse-client python3-dask python3-distributed jq
#
# usage: engines.sh QNTRACE FILE|DIR...
set -eu
qntrace=$1
shift
here=$(cd "$(dirname "$0")" && pwd)
work=$(mktemp -d)
server=
finish() {
    if [ -n "$server" ]; then kill "$server" 2>/dev/null && wait "$server" || true; fi
    rm -rf "$work"
}
trap finish EXIT

export_to() { # FOLDER, and options
    folder=$1
    shift
    status=0
    "$qntrace" export --to jsonl -o "$folder" "$@" || status=$?
    [ "$status" -le 1 ]
}
export_to "$work/plain" "$@"
export_to "$work/packed" --compress gzip "$@"

# COLUMN TAB NAME TAB RECORDS
{ "$qntrace" stats --json --top 0 "$@" 2>/dev/null || [ $? -eq 1 ]; } |
    jq -r 'select(.type == "component" or .type == "kind") | [.type, .comp // .kind, .records] | @tsv' |
    sort >"$work/expected"
[ -s "$work/expected" ]

compare() { # WHO
    sort -o "$work/found" "$work/found"
    if ! cmp -s "$work/expected" "$work/found"; then
        echo "$1 counts something else than qntrace stats:"
        diff "$work/expected" "$work/found" || true
        exit 1
    fi
    echo "$1 counts what qntrace stats counts:"
    sed 's/^/    /' "$work/found"
}

clickhouse() { clickhouse-client --host 127.0.0.1 --port "$port" "$@"; }

with_clickhouse() {
    port=$(/usr/bin/python3 -c 'import socket; s = socket.socket(); s.bind(("127.0.0.1", 0)); print(s.getsockname()[1])')
    mkdir "$work/clickhouse"
    cat >"$work/clickhouse/config.xml" <<CONFIG
<yandex>
    <path>$work/clickhouse/data/</path>
    <tmp_path>$work/clickhouse/tmp/</tmp_path>
    <listen_host>127.0.0.1</listen_host>
    <tcp_port>$port</tcp_port>
    <users_config>$work/clickhouse/users.xml</users_config>
    <default_profile>default</default_profile>
    <default_database>default</default_database>
    <mark_cache_size>67108864</mark_cache_size>
    <logger><level>warning</level><log>$work/clickhouse/log</log><errorlog>$work/clickhouse/errors</errorlog></logger>
</yandex>
CONFIG
    cat >"$work/clickhouse/users.xml" <<USERS
<yandex>
    <profiles><default></default></profiles>
    <quotas><default></default></quotas>
    <users><default>
        <password></password><networks><ip>127.0.0.1</ip></networks><profile>default</profile><quota>default</quota>
    </default></users>
</yandex>
USERS
    clickhouse-server --config-file="$work/clickhouse/config.xml" >"$work/clickhouse/out" 2>&1 &
    server=$!
    until clickhouse --query 'SELECT 1' >/dev/null 2>&1; do
        kill -0 "$server" || { cat "$work/clickhouse/out" "$work/clickhouse/errors"; exit 1; }
    done
    clickhouse --query 'SELECT version()' | sed 's/^/ClickHouse /'
    clickhouse --query 'CREATE TABLE records (cluster String, node String, node_id String, program String, trace String,
        path String, time_ns Int64, seq UInt32, thread UInt32, comp String, kind String, id Nullable(UInt32),
        message Nullable(String)) ENGINE = MergeTree ORDER BY (time_ns, seq) PARTITION BY program'
    find "$work/plain" -name '*.jsonl' -exec cat {} + |
        clickhouse --input_format_skip_unknown_fields=1 --query 'INSERT INTO records FORMAT JSONEachRow'
    clickhouse --query "SELECT 'component', comp, count() FROM records GROUP BY comp
                        UNION ALL SELECT 'kind', kind, count() FROM records GROUP BY kind" >"$work/found"
    compare ClickHouse
}

with_dask() {
    /usr/bin/python3 "$here/engine_dask.py" "$work/packed/*/*/*/*/*.jsonl.gz" >"$work/found"
    compare Dask
}

ran=no
if command -v clickhouse-server >/dev/null; then
    with_clickhouse
    ran=yes
else
    echo "ClickHouse is not installed"
fi
if /usr/bin/python3 -c "import distributed" 2>/dev/null; then
    with_dask
    ran=yes
else
    echo "Dask is not installed"
fi
[ "$ran" = yes ] || exit 77
