#include "tools/qntrace/export/sqlite_schema.h"

namespace qn::dump
{

const char *const sqlite_tables = R"(
CREATE TABLE files (
    file_id     INTEGER PRIMARY KEY,
    path        TEXT NOT NULL,
    cluster     TEXT,             -- NULL: not known
    node        TEXT NOT NULL,
    node_id     TEXT,             -- 16 hexadecimal digits; NULL: not known
    program     TEXT NOT NULL,
    trace       TEXT NOT NULL,
    page        INTEGER,          -- NULL: no page
    is_copy     INTEGER NOT NULL,
    bytes       INTEGER NOT NULL
);
CREATE TABLE records (
    record_id   INTEGER PRIMARY KEY, -- in the order of the export, that is by time
    file_id     INTEGER NOT NULL REFERENCES files,
    time_ns     INTEGER,             -- since 1970-01-01T00:00:00Z; NULL: not known
    seq         INTEGER NOT NULL,
    thread      INTEGER NOT NULL,
    comp        TEXT NOT NULL,
    kind        TEXT NOT NULL,
    id          INTEGER,             -- NULL: the record has none
    bytes       INTEGER NOT NULL,    -- of the record in its file
    body        TEXT NOT NULL,       -- a JSON object; integers of 64 bits are texts in it
    problem     TEXT                 -- NULL: the record is sound
);
CREATE TABLE losses (
    file_id         INTEGER PRIMARY KEY REFERENCES files,
    unfinished      INTEGER NOT NULL, -- records
    missing         INTEGER NOT NULL, -- records, between two others
    overwritten     INTEGER NOT NULL, -- records, before the oldest one, fillers included
    unspooled_pages INTEGER NOT NULL,
    last_reuse_time INTEGER NOT NULL  -- seconds since 1970; 0: no page was taken over unspooled
);
)";

const char *const sqlite_indices_and_views = R"(
CREATE INDEX records_by_time ON records (time_ns);
CREATE INDEX records_by_component ON records (comp, id, time_ns);
CREATE INDEX records_by_thread ON records (thread, time_ns);
CREATE INDEX records_by_kind ON records (kind, time_ns);

CREATE VIEW records_text AS
SELECT record_id,
       -- The division of SQL rounds towards 0; the second of a time before 1970 is the one below.
       CASE WHEN time_ns IS NOT NULL THEN
           strftime('%Y-%m-%dT%H:%M:%S', (time_ns - ((time_ns % 1000000000 + 1000000000) % 1000000000)) / 1000000000,
                    'unixepoch')
           || printf('.%09dZ', (time_ns % 1000000000 + 1000000000) % 1000000000) END AS time,
       node, program, trace, seq, printf('0x%08x', thread) AS thread, comp, kind, id, body, problem
FROM records JOIN files USING (file_id);

CREATE VIEW per_component AS
SELECT comp, count(*) AS records, sum(bytes) AS bytes FROM records GROUP BY comp ORDER BY records DESC, comp;

CREATE VIEW per_kind AS
SELECT kind, count(*) AS records, sum(bytes) AS bytes FROM records GROUP BY kind ORDER BY records DESC, kind;

CREATE VIEW per_id AS
SELECT comp, id, count(*) AS records, sum(bytes) AS bytes
FROM records WHERE id IS NOT NULL GROUP BY comp, id ORDER BY records DESC, comp, id;

CREATE VIEW per_thread AS
SELECT thread, count(*) AS records, sum(bytes) AS bytes, min(time_ns) AS first_ns, max(time_ns) AS last_ns
FROM records GROUP BY thread ORDER BY records DESC, thread;

CREATE VIEW per_second AS
SELECT (time_ns - ((time_ns % 1000000000 + 1000000000) % 1000000000)) / 1000000000 AS second, count(*) AS records,
       sum(bytes) AS bytes
FROM records WHERE time_ns IS NOT NULL GROUP BY 1 ORDER BY 1;

CREATE VIEW errors AS
SELECT record_id, time_ns, node, program, thread, comp, id,
       json_extract(body, '$.error_id') AS error_id,
       json_extract(body, '$.function') AS function,
       json_extract(body, '$.file') AS file,
       json_extract(body, '$.line') AS line,
       json_extract(body, '$.message') AS message
FROM records JOIN files USING (file_id) WHERE kind = 'error';
)";

} // namespace qn::dump
