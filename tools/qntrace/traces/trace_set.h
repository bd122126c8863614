// What the arguments of a command name, as a list of files to read.
//
// An argument is a trace file, a page or a copy; a trace by its name, which stands for the file of that name and for
// the pages of its page set (app.trc for app.trc and app.trc.1.sp, app.trc.2.sp, ...); or a folder, which stands for
// all copies below it and for the trace files that lie in it. Files in a folder that nobody
// would take for trace files are passed over, and counted on standard error; damaged ones and those of a newer format are
// not.
//
// No life of a ring is read twice. A page keeps its records when they were copied, and its state does not tell whether
// they are elsewhere: in the states 2 and 8 a copy may be in the making, and a page of the state 4 may never have been
// copied, when the program was started again before. So the records decide. Two files are of one life of a ring when
// they have the name of the trace and the number of the page in common, the node, and the first record with its time
// stamp, sequence number, thread and component. Records are only ever added to a life, so the file whose last record is
// later holds all that the other one holds, and is read; of two alike the copy is, which nobody writes to. The process
// that the headers name is not compared: the next start of the program changes it in the page, and not in the copy.
//
// Two copies of a single file whose ring has moved on between them have other first records and are both read.
#pragma once

#include <array>
#include <cstdint>
#include <ctime>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "tools/qntrace/reader/reader.h"

namespace CLI
{
class App;
}

namespace qn::dump
{

// The first record that carries data.
struct first_record {
    std::uint64_t counter = 0;
    std::uint32_t seq = 0;
    std::uint32_t thread = 0;
    std::array<char, 4> component = {};
    std::optional<timespec> time;
};

struct trace_source {
    std::string path;
    std::uint64_t bytes = 0;
    std::string trace;      // the trace's name, without the number of the page and the time of the copy
    std::uint32_t page = 0; // counts from 1; 0: no page
    bool copy = false;

    // From the folders of a copy, as far as there are any; those of a live file from a copy of the same node.
    std::string cluster;
    std::string host;
    // From the header, or from the folders when the header has none.
    std::string node_id; // 16 hexadecimal digits
    std::uint16_t node_number = 0;
    std::string program;

    std::optional<first_record> first; // nothing when no record can be read

    // The host, or else what there is to tell the node.
    std::string node() const;
};

struct trace_set {
    std::vector<trace_source> sources; // in the order of the arguments, then by name
    int status = 0;                    // an exit status: what was named and is not there was told
};

// Whether a life of a ring that several files hold is in the set once, or with every one of them. Who wants every file
// also gets the pages whose header is broken, by their names; in a folder they are passed over otherwise.
enum class duplicates { dropped, kept };

// The pages of the trace of that name, by their numbers.
std::map<std::uint32_t, std::string> pages_of(const std::string &trace);

// Whether it is told how many other files there are in a folder.
enum class passed_over { told, untold };

trace_set find_traces(const std::vector<std::string> &arguments, duplicates choice = duplicates::dropped,
                      passed_over others = passed_over::told);

// Adds FILE..., whose values go to `arguments`.
void add_traces_option(CLI::App &command, std::vector<std::string> &arguments);

// Throws std::invalid_argument when a file that is to be written is one of the traces.
void check_output(const std::string &output, const trace_set &traces);

} // namespace qn::dump
