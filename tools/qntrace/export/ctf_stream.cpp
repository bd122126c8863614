#include "tools/qntrace/export/ctf_stream.h"

#include "tools/qntrace/export/ctf_event.h"
#include "tools/qntrace/export/ctf_metadata.h"

namespace qn::dump
{
namespace
{
constexpr std::size_t usual_packet_bytes = 64 * 1024;
} // namespace

// A packet tells how many are missing up to its end, so the one that was filled before is ended. Readers count from
// packet to packet; so that they can count what is missing before the first event, a packet without any comes first.
void ctf_stream::discard(std::uint64_t records)
{
    end_packet();
    if (packets_ == 0) {
        packet_begin_ = newest_;
        write_packet({});
    }
    discarded_ += records;
}

void ctf_stream::add(std::uint64_t ns, std::string_view event, std::string_view file)
{
    if (packet_.empty()) {
        packet_begin_ = ns;
        packet_file_ = file;
    }
    newest_ = ns;
    packet_ += event;
    if (packet_.size() >= usual_packet_bytes) end_packet();
}

void ctf_stream::end_packet()
{
    if (!packet_.empty()) write_packet(packet_file_);
}

void ctf_stream::end_source(std::string_view file)
{
    end_packet();
    if (discarded_ == written_discarded_) return;
    packet_begin_ = newest_;
    write_packet(file);
}

void ctf_stream::write_packet(std::string_view file)
{
    std::string head;
    append_u32(head, ctf_magic);
    append_u32(head, 0); // stream_id
    append_u64(head, packet_begin_);
    append_u64(head, newest_);
    std::string tail; // of the packet context, behind its sizes
    append_u64(tail, packets_++);
    append_u64(tail, discarded_);
    append_text(tail, file);
    const std::uint64_t bits = 8 * (head.size() + 2 * sizeof(std::uint64_t) + tail.size() + packet_.size());
    append_u64(head, bits); // content_size
    append_u64(head, bits); // packet_size
    file_.write(head);
    file_.write(tail);
    file_.write(packet_);
    packet_.clear();
    written_discarded_ = discarded_;
}

} // namespace qn::dump
