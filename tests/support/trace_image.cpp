#include "support/trace_image.h"

#include <algorithm>
#include <cstring>

#include <gtest/gtest.h>

#include "support/scratch.h"

namespace
{
template <class T>
T number_at(const std::string &bytes, size_t at)
{
    T value = 0;
    if (at + sizeof value > bytes.size()) {
        ADD_FAILURE() << "offset " << at << " is outside " << bytes.size() << " bytes";
        return 0;
    }
    std::memcpy(&value, bytes.data() + at, sizeof value);
    return value;
}
} // namespace

namespace qn::test
{
uint8_t record_image::u8(size_t at) const { return number_at<uint8_t>(bytes, at); }
uint16_t record_image::u16(size_t at) const { return number_at<uint16_t>(bytes, at); }
uint32_t record_image::u32(size_t at) const { return number_at<uint32_t>(bytes, at); }
uint64_t record_image::u64(size_t at) const { return number_at<uint64_t>(bytes, at); }

std::string record_image::text(size_t at) const
{
    const size_t end = bytes.find('\0', at);
    EXPECT_NE(end, std::string::npos) << "no NUL behind offset " << at;
    return bytes.substr(at, end - at);
}

trace_image trace_image::of_file(const std::string &name) { return trace_image(file_bytes(name)); }

uint8_t trace_image::u8(size_t at) const { return number_at<uint8_t>(bytes_, at); }
uint16_t trace_image::u16(size_t at) const { return number_at<uint16_t>(bytes_, at); }
uint32_t trace_image::u32(size_t at) const { return number_at<uint32_t>(bytes_, at); }
uint64_t trace_image::u64(size_t at) const { return number_at<uint64_t>(bytes_, at); }

std::string trace_image::text(size_t at, size_t field_size) const
{
    const std::string field = bytes_.substr(at, field_size);
    return field.substr(0, field.find('\0'));
}

std::vector<record_image> trace_image::ring() const
{
    std::vector<record_image> records;
    uint64_t offset = oldest_offset();
    uint64_t covered = 0;
    const uint64_t ring_bytes = size() - ring_offset();
    while (covered < ring_bytes) {
        if (offset < ring_offset() || offset + 28 > size()) {
            ADD_FAILURE() << "no record fits at offset " << offset;
            return records;
        }
        const uint32_t length = u32(offset);
        if (length < 28 || offset + length > size()) {
            ADD_FAILURE() << "record at " << offset << " has length " << length;
            return records;
        }
        records.push_back({offset, bytes_.substr(offset, length)});
        covered += length;
        offset += length;
        if (offset == size()) offset = ring_offset();
    }
    EXPECT_EQ(covered, ring_bytes) << "the records do not tile the ring";
    EXPECT_EQ(offset, oldest_offset()) << "the walk does not end where it began";
    return records;
}

std::vector<record_image> trace_image::records() const
{
    std::vector<record_image> data = ring();
    std::erase_if(data, [](const record_image &record) { return !record.is_data(); });
    return data;
}

std::vector<record_image> trace_image::records_of(uint16_t function) const
{
    std::vector<record_image> data = ring();
    std::erase_if(data, [=](const record_image &record) { return record.function() != function; });
    return data;
}
} // namespace qn::test
