#include "export/samples.h"

#include <algorithm>
#include <filesystem>
#include <sstream>

#include "reader/every_kind.h"
#include "reader/spool_directory.h"

namespace qn::test
{
namespace
{

namespace fs = std::filesystem;
using nlohmann::json;

strings every_kind_little(const scratch_folder &folder) { return {folder.file("every.trc", every_kind().bytes())}; }

strings every_kind_big(const scratch_folder &folder)
{
    return {folder.file("every.trc", every_kind(endian::big).bytes())};
}

strings golden(const scratch_folder &) { return {GOLDEN_FOLDER "/golden.trc"}; }

trace_builder indexer(std::uint64_t ms, const std::vector<std::uint32_t> &ids, std::uint64_t node_id)
{
    auto file = ids_from(ms, ids, node_id);
    file.put_text(132, "indexer");
    return file;
}

strings two_nodes(const scratch_folder &folder)
{
    const auto put = [&](const std::string &below, const std::string &name, const trace_builder &file) {
        fs::create_directories(folder.path("spool/" + below));
        folder.file("spool/" + below + "/" + name, file.bytes());
    };
    const auto one = "prod/0001/host1/00000000000000a1/indexer";
    const auto two = "prod/0001/host2/00000000000000a2/indexer";
    put(one, "app.trc.1.sp.2026_11_21_05_12_01.000001", indexer(1, {1, 2, 3}, 0xA1));
    put(one, "app.trc.2.sp.2026_11_21_05_12_02.000001", indexer(4, {4, 5, 6}, 0xA1));
    put(two, "app.trc.1.sp.2026_11_21_05_12_01.000001", indexer(2, {11, 12, 13}, 0xA2));
    return {folder.path("spool")};
}

// A clock that trembles, and that jumps.
strings steps_back(const scratch_folder &folder)
{
    trace_builder file;
    for (const std::uint64_t microsecond : {10, 12, 11, 13, 14, 13, 15, 3, 4, 5, 1, 20, 21, 2, 22}) {
        file.counter = 1'000'000'000 + microsecond * 1000 + 7;
        file.add_id(static_cast<std::uint32_t>(file.seq));
    }
    file.close();
    return {folder.file("steps.trc", file.bytes())};
}

// Two pages: of the first one contents are missing, and single records of both.
strings pages_with_losses(const scratch_folder &folder)
{
    trace_builder first;
    first.seq = static_cast<std::uint32_t>(-2);
    first.put_u32(188, 1'795'237'900);
    first.component = "____";
    first.add(2, first.body().text("SPOOL: /tmp/app.trc.1.sp not spooled 3 consecutive times"));
    first.component = "APP";
    first.add_id(1);
    first.seq += 10; // five records
    first.add_id(2);
    first.add(0xFFFF, first.body().u32(1));
    first.close();
    trace_builder second;
    second.counter = 2'000'000'000;
    second.seq = 8; // four
    second.add_id(3);
    second.add_id(4);
    second.add(0xFFFF, second.body().u32(1));
    second.close();
    folder.file("app.trc.1.sp", first.bytes());
    folder.file("app.trc.2.sp", second.bytes());
    return {folder.path("app.trc")};
}

strings selected(const scratch_folder &folder)
{
    return {"--comp", "IDX", "--kind", "id,values64", folder.file("every.trc", every_kind().bytes())};
}

strings with_offsets(const scratch_folder &folder)
{
    strings arguments = {"--offset", "host1=+1.5ms", "--offset", "00000000000000a2=-3ns"};
    for (const auto &argument : two_nodes(folder)) arguments.push_back(argument);
    return arguments;
}

// Texts that would do harm in a terminal, a shell, a page or a query.
strings hostile(const scratch_folder &folder)
{
    trace_builder file;
    file.put_text(132, "a'b\"c\n<d>;`e`\x1b[31m");
    file.component = "A\"\\";
    file.add_strings(1, {"'; DROP TABLE records; --", "</script>", "\x1b]0;title\x07", "\xff\xfe", "$(reboot)",
                         "\xe2\x80\xae turned", "line\nline", "a\x01z"});
    file.component = "B\x01\x7f";
    file.add_id(2);
    file.close();
    return {folder.file("hostile 'name\".trc", file.bytes())};
}

strings damaged(const scratch_folder &folder)
{
    trace_builder file;
    for (std::uint32_t id = 0; id < 20; ++id) file.add_id(id);
    const auto torn = file.add_id(20);
    file.add_id(21);
    file.close();
    file.put_u32(torn, 3); // no length
    file.put_u16(200 + 32 + 4, 77);
    return {folder.file("damaged.trc", file.bytes())};
}

outcome merged(const strings &arguments)
{
    strings all = {"merge", "--json", "--utc"};
    // Options of an export only.
    for (auto argument = arguments.begin(); argument != arguments.end(); ++argument) {
        if (*argument == "--compress")
            ++argument;
        else if (*argument != "--force")
            all.push_back(*argument);
    }
    return run_qntrace(all);
}

} // namespace

const std::vector<sample> &samples()
{
    static const std::vector<sample> all = {
        {"EveryKindLittleEndian", every_kind_little},
        {"EveryKindBigEndian", every_kind_big},
        {"Golden", golden},
        {"TwoNodes", two_nodes},
        {"StepsBack", steps_back},
        {"PagesWithLosses", pages_with_losses},
        {"Selected", selected},
        {"WithOffsets", with_offsets},
        {"Hostile", hostile},
        {"Damaged", damaged},
    };
    return all;
}

std::string sample_name(const testing::TestParamInfo<sample> &info) { return info.param.name; }

outcome export_to(const std::string &format, const std::string &out, const strings &arguments,
                  const surroundings &around)
{
    strings all = {"export", "--to", format, "-o", out};
    all.insert(all.end(), arguments.begin(), arguments.end());
    return run_qntrace(all, around);
}

void exported(const std::string &format, const std::string &out, const strings &arguments)
{
    const auto made = export_to(format, out, arguments);
    EXPECT_EQ(made.status, merged(arguments).status) << made.err;
    EXPECT_EQ(made.out, "");
}

std::string shell(const std::string &command)
{
    surroundings around;
    around.environment = {"LC_ALL=C.UTF-8", "TZ=UTC", "PATH=/usr/local/bin:/usr/bin:/bin", "HOME=/nonexistent"};
    const auto done = run_program("/bin/sh", {"-c", "set -e\n" + command}, around);
    EXPECT_EQ(done.status, 0) << command << "\n" << done.err;
    return done.out;
}

strings lines_of(const std::string &text)
{
    strings lines;
    std::istringstream in(text);
    for (std::string line; std::getline(in, line);) lines.push_back(line);
    return lines;
}

strings tree_of(const std::string &folder)
{
    strings found;
    for (const auto &entry : fs::recursive_directory_iterator(folder))
        found.push_back(fs::relative(entry.path(), folder).string());
    std::sort(found.begin(), found.end());
    return found;
}

strings merged_lines(const strings &arguments) { return lines_of(merged(arguments).out); }

namespace
{

std::vector<json> stats_of(const strings &arguments)
{
    // Counting needs no clocks that are put right, and does not know how to.
    strings all = {"stats", "--json", "--utc", "--top", "0"};
    for (auto argument = arguments.begin(); argument != arguments.end(); ++argument) {
        if (*argument == "--offset")
            ++argument;
        else
            all.push_back(*argument);
    }
    return rows(run_qntrace(all));
}

} // namespace

counts counts_by_stats(const strings &arguments)
{
    counts found;
    for (const auto &row : stats_of(arguments)) {
        const std::string type = row.at("type");
        std::string key = type + " ";
        if (type == "component")
            key += row.at("comp").get<std::string>();
        else if (type == "kind")
            key += row.at("kind").get<std::string>();
        else if (type == "id")
            key += row.at("comp").get<std::string>() + " " + std::to_string(row.at("id").get<std::uint32_t>());
        else if (type == "thread")
            key += std::to_string(row.at("thread").get<std::uint32_t>());
        else
            continue;
        found[key] = row.at("records");
    }
    EXPECT_FALSE(found.empty());
    return found;
}

counts counts_in(const std::string &lines)
{
    counts found;
    for (const auto &line : lines_of(lines)) {
        const auto tab = line.rfind('\t');
        found[line.substr(0, tab)] += std::stoull(line.substr(tab + 1));
    }
    return found;
}

counts losses_by_stats(const strings &arguments)
{
    counts found;
    const auto stats = stats_of(arguments);
    for (const char *member : {"unfinished", "missing", "overwritten", "unspooled_pages"})
        found[member] = stats.at(0).at(member);
    return found;
}

} // namespace qn::test
