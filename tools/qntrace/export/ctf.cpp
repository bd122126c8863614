// CTF 1.8, the Common Trace Format: for every program of a node a trace in a folder of its own, and in it streams.
//
// The time of a stream must not go back, that of a source may. So a record goes to the stream whose newest event is the
// latest one that is not later than the record, and starts another stream when there is none: as many streams as it
// takes, and no time is changed. Pages of a trace, which follow each other, share their streams.
#include <optional>
#include <set>
#include <utility>

#include "tools/qntrace/export/ctf_event.h"
#include "tools/qntrace/export/ctf_metadata.h"
#include "tools/qntrace/export/ctf_stream.h"
#include "tools/qntrace/export/format.h"
#include "tools/qntrace/export/record_time.h"
#include "tools/qntrace/export/tree.h"
#include "tools/qntrace/format/durations.h"

namespace qn::dump
{
namespace
{

// More stand open at a time only for a file whose time stamps are rubbish.
constexpr std::size_t most_streams = 64;

// Of the records in a page that was overwritten before it was copied nobody knows the number: it counts as one.
std::uint64_t lost_records(const losses &lost)
{
    return lost.unfinished + lost.missing + lost.overwritten + lost.unspooled;
}

class ctf_export final : public export_format
{
public:
    ctf_export(const source_list &sources, const std::string &folder) : sources_(sources), tree_(folder) {}

    void record(std::size_t source, const merge_stream &stream) override
    {
        begin(source);
        const auto &record = stream.record();
        const auto ns = record_ns(record);
        ctf_stream *into = ns && *ns >= 0 ? stream_for(static_cast<std::uint64_t>(*ns)) : nullptr;
        const bool time_kept = into != nullptr;
        if (into == nullptr) into = &some_stream();
        const std::uint64_t time = time_kept ? static_cast<std::uint64_t>(*ns) : into->newest();
        discard_up_to(lost_records(stream.lost()), *into);
        event_.clear();
        append_ctf_event(event_, record, time, record_problem(record, time_kept));
        into->add(time, event_, sources_[source].path);
        last_ = into;
    }

    void end_of_source(std::size_t source, const losses &lost) override
    {
        begin(source);
        if (lost_records(lost) > told_) discard_up_to(lost_records(lost), some_stream());
        for (const auto &stream : streams_) stream->end_source(sources_[source].path);
        told_ = 0;
    }

    void finish() override { close_streams(); }

private:
    // Sources of one program of a node and one trace come behind each other, and share their streams; unless these are
    // many already, which leaves too little for what the source itself may need.
    void begin(std::size_t source)
    {
        if (source_ == source) return;
        source_ = source;
        std::string folder = folder_of(sources_[source]);
        if (folder == folder_ && sources_[source].trace == trace_ && streams_.size() <= most_streams / 2) return;
        close_streams();
        folder_ = std::move(folder);
        trace_ = sources_[source].trace;
    }

    // Null when the time fits no stream, and there are too many to begin another.
    ctf_stream *stream_for(std::uint64_t ns)
    {
        ctf_stream *best = nullptr;
        for (const auto &stream : streams_)
            if (stream->newest() <= ns && (best == nullptr || stream->newest() > best->newest())) best = stream.get();
        if (best == nullptr && streams_.size() < most_streams) best = &new_stream(ns);
        return best;
    }

    // For what has no time, or none that fits: it stands behind the record before it.
    ctf_stream &some_stream()
    {
        if (last_ != nullptr) return *last_;
        return streams_.empty() ? new_stream(first_ns()) : *streams_.front();
    }

    std::uint64_t first_ns() const
    {
        const auto &first = sources_[*source_].first;
        const auto ns = first && first->time ? nanoseconds_of(*first->time) : std::nullopt;
        return ns && *ns > 0 ? static_cast<std::uint64_t>(*ns) : 0;
    }

    ctf_stream &new_stream(std::uint64_t ns)
    {
        const std::string path = tree_.add(folder_, trace_ + ".stream", "");
        if (described_.insert(folder_).second) {
            output_file metadata(tree_.whole(folder_ + "/metadata"));
            metadata.write(ctf_metadata(sources_[*source_]));
            metadata.close();
        }
        return *streams_.emplace_back(std::make_unique<ctf_stream>(tree_.whole(path), ns));
    }

    void discard_up_to(std::uint64_t lost, ctf_stream &into)
    {
        if (lost > told_) into.discard(lost - told_);
        told_ = lost;
    }

    void close_streams()
    {
        for (const auto &stream : streams_) stream->close();
        streams_.clear();
        last_ = nullptr;
    }

    const source_list &sources_;
    export_tree tree_;
    std::set<std::string> described_; // folders with metadata

    std::optional<std::size_t> source_; // that is being read
    std::string folder_;
    std::string trace_;
    std::vector<std::unique_ptr<ctf_stream>> streams_;
    ctf_stream *last_ = nullptr; // with the newest record
    std::uint64_t told_ = 0;     // how many records are missing from the source, as far as streams tell
    std::string event_;
};

} // namespace

std::unique_ptr<export_format> make_ctf_export(const source_list &sources, const std::string &folder)
{
    return std::make_unique<ctf_export>(sources, folder);
}

} // namespace qn::dump
