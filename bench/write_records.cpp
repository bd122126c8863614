// Traces a given number of records of several kinds, for who measures how fast they are read.
//
//   write_records FILE RECORDS
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>

#include <qn_tr.h>

namespace
{

constexpr const char *component = "BNCH";
constexpr unsigned most_bytes_of_a_record = 80; // so that none is overwritten

tr_detail_level_t levels[1];
const tr_category_description_t categories[1] = {{0, "Bench", 1, 1}};

int write_one(std::uint64_t number)
{
    switch (number % 4) {
    case 0: return tr_record_id_1(component, 7);
    case 1: return tr_record_uint64_2_1(component, 8, number, ~number);
    case 2: return tr_record_uint32_2_1(component, 9, static_cast<qn_uint32_t>(number), 2);
    default: return tr_record_strings_1(component, 10, 1, "0123456789abcdef");
    }
}

} // namespace

int main(int argc, char **argv)
{
    if (argc != 3) {
        std::fprintf(stderr, "usage: write_records FILE RECORDS\n");
        return 2;
    }
    const std::uint64_t records = std::strtoull(argv[2], nullptr, 10);
    setenv("QN_TR_SPOOL", "none", 1);
    setenv("QN_TR_SIZE", std::to_string(records * most_bytes_of_a_record + 65536).c_str(), 1);
    if (tr_set_filename_1(argv[1]) != 0 || tr_register_component_1(component, levels, categories, 1) != 0) return 1;
    for (std::uint64_t number = 0; number < records; ++number)
        if (write_one(number) != 0) return 1;
    tr_term();
    return 0;
}
