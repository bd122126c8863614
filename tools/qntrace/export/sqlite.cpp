// A SQLite database: a row for every file, every record, and what is missing from every file.
//
// It is written in one transaction without a journal, as nobody sees it before it is complete. SQL integers are signed
// and have 64 bits; unsigned values of as many bits, which a record's body may hold, are digits in a text there.
#include <cstdlib>

#include <fmt/format.h>
#include <sqlite3.h>

#include "tools/qntrace/console/findings.h"
#include "tools/qntrace/console/output.h"
#include "tools/qntrace/export/format.h"
#include "tools/qntrace/export/record_time.h"
#include "tools/qntrace/export/sqlite_schema.h"
#include "tools/qntrace/format/escape.h"
#include "tools/qntrace/format/json.h"
#include "tools/qntrace/format/record_names.h"
#include "tools/qntrace/select/record.h"

namespace qn::dump
{
namespace
{

// Text that everybody can read: what is no visible UTF-8 is an escape.
std::string printable(std::string_view text)
{
    std::string out;
    append_escaped(out, text, charset::utf_8);
    return out;
}

struct finalize {
    void operator()(sqlite3_stmt *statement) const { sqlite3_finalize(statement); }
};
struct close_database {
    void operator()(sqlite3 *database) const { sqlite3_close(database); }
};

class database
{
public:
    explicit database(const std::string &path) : path_(path)
    {
        sqlite3 *opened = nullptr;
        const int result = sqlite3_open_v2(path.c_str(), &opened, SQLITE_OPEN_READWRITE | SQLITE_OPEN_CREATE, nullptr);
        handle_.reset(opened);
        check(result);
    }

    void run(const char *commands) { check(sqlite3_exec(handle_.get(), commands, nullptr, nullptr, nullptr)); }

    void check(int result) const
    {
        if (result == SQLITE_OK || result == SQLITE_DONE || result == SQLITE_ROW) return;
        throw output_error(
            fmt::format("{}: cannot be written: {}", printable_name(path_), sqlite3_errmsg(handle_.get())));
    }

    sqlite3 *handle() const { return handle_.get(); }

private:
    std::string path_;
    std::unique_ptr<sqlite3, close_database> handle_;
};

// INSERT of one row, whose values are given in the order of the columns.
class inserter
{
public:
    inserter(const database &into, const std::string &table, int columns) : into_(into)
    {
        std::string text = "INSERT INTO " + table + " VALUES (?";
        for (int i = 1; i < columns; ++i) text += ", ?";
        sqlite3_stmt *prepared = nullptr;
        into.check(sqlite3_prepare_v2(into.handle(), (text + ")").c_str(), -1, &prepared, nullptr));
        statement_.reset(prepared);
    }

    inserter &integer(std::int64_t value)
    {
        into_.check(sqlite3_bind_int64(statement_.get(), ++bound_, value));
        return *this;
    }
    template <typename T>
    inserter &integer_or_null(const std::optional<T> &value)
    {
        return value ? integer(static_cast<std::int64_t>(*value)) : null();
    }
    // The text must live until go().
    inserter &text(std::string_view value)
    {
        into_.check(
            sqlite3_bind_text64(statement_.get(), ++bound_, value.data(), value.size(), SQLITE_STATIC, SQLITE_UTF8));
        return *this;
    }
    inserter &text_or_null(std::string_view value) { return value.empty() ? null() : text(value); }
    inserter &null()
    {
        into_.check(sqlite3_bind_null(statement_.get(), ++bound_));
        return *this;
    }

    void go()
    {
        into_.check(sqlite3_step(statement_.get()));
        into_.check(sqlite3_reset(statement_.get()));
        bound_ = 0;
    }

private:
    const database &into_;
    std::unique_ptr<sqlite3_stmt, finalize> statement_;
    int bound_ = 0;
};

class sqlite_export final : public export_format
{
public:
    sqlite_export(const source_list &sources, const std::string &path) : database_(prepared(path))
    {
        inserter files(database_, "files", 10);
        for (std::size_t i = 0; i < sources.size(); ++i) add_file(files, file_id(i), sources[i]);
    }

    void record(std::size_t source, const merge_stream &stream) override
    {
        const auto &record = stream.record();
        const auto ns = record_ns(record);
        const std::string component = printable(component_name(record.raw.header));
        const std::string problem = record_problem(record, ns.has_value());
        body_.clear();
        format_.body(body_, record);
        body_.pop_back(); // the end of the line
        records_
            .null() // numbered by the database
            .integer(file_id(source))
            .integer_or_null(ns)
            .integer(record.raw.header.seq)
            .integer(record.raw.header.thread)
            .text(component)
            .text(kind_name(record.body))
            .integer_or_null(id_of(record.body))
            .integer(record.raw.header.length)
            .text(body_)
            .text_or_null(problem)
            .go();
    }

    void end_of_source(std::size_t source, const losses &lost) override
    {
        const auto count = [](std::uint64_t records) { return static_cast<std::int64_t>(records); };
        losses_.integer(file_id(source))
            .integer(count(lost.unfinished))
            .integer(count(lost.missing))
            .integer(count(lost.overwritten))
            .integer(count(lost.unspooled))
            .integer(lost.last_reuse_time)
            .go();
    }

    void finish() override
    {
        database_.run(sqlite_indices_and_views);
        database_.run("COMMIT");
    }

private:
    static database prepared(const std::string &path)
    {
        database made(path);
        made.run("PRAGMA journal_mode = OFF; PRAGMA synchronous = OFF; BEGIN");
        made.run(sqlite_tables);
        return made;
    }

    static std::int64_t file_id(std::size_t source) { return static_cast<std::int64_t>(source) + 1; }

    static void add_file(inserter &files, std::int64_t id, const trace_source &source)
    {
        const std::string path = printable(source.path);
        const std::string cluster = printable(source.cluster);
        const std::string node = printable(source.node());
        const std::string program = printable(source.program);
        const std::string trace = printable(source.trace);
        files.integer(id)
            .text(path)
            .text_or_null(cluster)
            .text(node)
            .text_or_null(source.node_id)
            .text(program)
            .text(trace)
            .integer_or_null(source.page == 0 ? std::nullopt : std::optional(source.page))
            .integer(source.copy ? 1 : 0)
            .integer(static_cast<std::int64_t>(source.bytes))
            .go();
    }

    database database_;
    inserter records_{database_, "records", 11};
    inserter losses_{database_, "losses", 6};
    json_dump format_{{false, true}};
    std::string body_;
};

} // namespace

std::unique_ptr<export_format> make_sqlite_export(const source_list &sources, const std::string &file)
{
    return std::make_unique<sqlite_export>(sources, file);
}

} // namespace qn::dump
