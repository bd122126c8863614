// JSON lines for the engines that read many files by a pattern: a file for every source with records, in folders that
// tell where it comes from, and a file about all sources.
#include <filesystem>
#include <optional>
#include <utility>

#include "tools/qntrace/console/output_file.h"
#include "tools/qntrace/export/format.h"
#include "tools/qntrace/export/tree.h"
#include "tools/qntrace/format/json.h"
#include "tools/qntrace/format/json_text.h"
#include "tools/qntrace/traces/losses_json.h"
#include "tools/qntrace/traces/origin_members.h"

namespace qn::dump
{
namespace
{

std::string suffix_of(compression packed)
{
    switch (packed) {
    case compression::gzip: return ".jsonl.gz";
    case compression::zstd: return ".jsonl.zst";
    case compression::none: break;
    }
    return ".jsonl";
}

class jsonl_export final : public export_format
{
public:
    jsonl_export(const source_list &sources, const std::string &folder, compression packed)
        : sources_(sources), tree_(folder), packed_(packed), about_sources_(folder + "/sources.ndjson")
    {
    }

    void record(std::size_t source, const merge_stream &stream) override
    {
        if (!file_) begin(sources_[source]);
        line_.clear();
        format_.record(line_, stream.record(), origin_);
        file_->write(line_);
        ++records_;
    }

    void end_of_source(std::size_t source, const losses &lost) override
    {
        if (file_) file_->close();
        describe(sources_[source], lost);
        file_.reset();
        records_ = 0;
    }

    void finish() override { about_sources_.close(); }

private:
    void begin(const trace_source &source)
    {
        origin_ = origin_with_path(source);
        path_ =
            tree_.add(folder_of(source), std::filesystem::path(source.path).filename().string(), suffix_of(packed_));
        file_.emplace(tree_.whole(path_), make_packer(packed_));
    }

    void describe(const trace_source &source, const losses &lost)
    {
        line_.clear();
        append_object(line_, [&](text_encoder &encode) {
            nlohmann::ordered_json object;
            for (const auto &[name, value] : origin_with_path(source)) object[name] = encode.text(value);
            object["output"] = file_ ? encode.text(path_) : nlohmann::ordered_json(nullptr);
            object["records"] = records_;
            object.update(losses_json(lost));
            return object;
        });
        about_sources_.write(line_);
    }

    const source_list &sources_;
    export_tree tree_;
    compression packed_;
    output_file about_sources_;
    json_dump format_{{false, true}}; // times in UTC: the output does not depend on where it is made

    // Of the source that is being read.
    std::optional<output_file> file_; // from its first record on
    std::string path_;                // of the file, below the tree's root
    text_members origin_;
    std::uint64_t records_ = 0;
    std::string line_;
};

} // namespace

std::unique_ptr<export_format> make_jsonl_export(const source_list &sources, const std::string &folder,
                                                 compression packed)
{
    return std::make_unique<jsonl_export>(sources, folder, packed);
}

} // namespace qn::dump
