// Tens of thousands of formats, made of all sorts of pieces by chance, against vsnprintf().
#include <array>
#include <cstdint>
#include <initializer_list>
#include <random>
#include <string>
#include <type_traits>

#include <gtest/gtest.h>

#include "recording/both_texts.h"

using namespace qn::test;

namespace
{
constexpr size_t most_arguments = 10;

// A format and its arguments, which are passed in 64 bits each. The same seed makes the same format everywhere.
class random_format
{
public:
    explicit random_format(unsigned seed) : engine_(seed)
    {
        const unsigned pieces = below(8);
        for (unsigned i = 0; i < pieces; ++i) add_piece();
        // What is not complete may only end the format: a piece behind it would complete it, to take who knows what.
        if (below(20) == 0) text_ += one_of({"%", "%-", "%0", "%5", "%ll", "%h", "%08z", "%."});
    }

    void compare() const
    {
        const auto &a = arguments_;
        expect_as_vsnprintf(text_.c_str(), a[0], a[1], a[2], a[3], a[4], a[5], a[6], a[7], a[8], a[9], 2.5, -1e100);
    }

    const std::string &text() const { return text_; }

private:
    unsigned below(unsigned number) { return static_cast<unsigned>(engine_() % number); }

    const char *one_of(std::initializer_list<const char *> all)
    {
        return all.begin()[below(static_cast<unsigned>(all.size()))];
    }

    template <class Argument>
    void add_argument(Argument argument)
    {
        if constexpr (std::is_pointer_v<Argument>)
            arguments_[used_++] = reinterpret_cast<uint64_t>(argument);
        else
            arguments_[used_++] = static_cast<uint64_t>(argument);
    }

    // Any number of bits, so that there are small numbers too; half of them negative.
    uint64_t integer()
    {
        const unsigned dropped_bits = below(64);
        const uint64_t value = engine_() >> dropped_bits;
        return below(2) == 0 ? value : 0 - value;
    }

    void add_flags_and_width()
    {
        for (unsigned flags = below(3); flags > 0; --flags) text_ += one_of({"-", "0", "-", "0", "+", " ", "#", "'"});
        if (below(2) == 0) text_ += one_of({"1", "2", "5", "8", "12", "23", "40"});
        if (below(12) == 0) text_ += one_of({".", ".0", ".3", ".12"});
    }

    void add_common_width()
    {
        text_ += one_of({"", "", "-", "0", "-0"});
        text_ += one_of({"", "3", "8", "20"});
    }

    void add_piece()
    {
        const unsigned kind = below(12);
        if (kind < 4 || used_ + 2 > most_arguments) {
            text_ += one_of({"a", " of ", ": ", "%%", "0x", "5", "-", "connection to ", "", "\xC3\xA9", "\n",
                             "text that is longer than what is copied byte by byte"});
            return;
        }
        text_ += '%';
        if (kind < 8) {
            below(3) == 0 ? add_flags_and_width() : add_common_width();
            text_ += one_of({"", "", "", "hh", "h", "l", "ll", "z", "j", "t"});
            text_ += one_of({"d", "i", "u", "x", "X", "o"});
            add_argument(integer());
        } else if (kind == 8) {
            below(6) == 0 ? add_flags_and_width() : add_common_width();
            text_ += "s";
            add_argument(one_of({"", "s", "string", "%d", "a string of forty characters, or some more"}));
        } else if (kind == 9) {
            add_common_width();
            text_ += below(2) == 0 ? "c" : "p";
            add_argument(below(8) == 0 ? 0 : integer());
        } else {
            add_rarity();
        }
    }

    void add_rarity()
    {
        switch (below(8)) {
        case 0:
            text_ += "*d";
            add_argument(static_cast<int>(below(40)) - 20);
            add_argument(integer());
            break;
        case 1:
            text_ += "s";
            add_argument(static_cast<const char *>(nullptr));
            break;
        case 2:
            text_ += "ls";
            add_argument(L"wide");
            break;
        case 3: text_ += "m"; break;
        case 4:
            if (floats_++ < 2) text_ += one_of({"f", "5.1f", "g", "-12e"});
            break;
        case 5: text_ += one_of({"y", "!", "5%", "-%", "hhhd", "5-d", "lhd", ";"}); break;
        case 6:
            text_ += "qd";
            add_argument(integer());
            break;
        default: text_ += "%";
        }
    }

    std::mt19937_64 engine_;
    std::string text_;
    std::array<uint64_t, most_arguments> arguments_{};
    size_t used_ = 0;
    unsigned floats_ = 0;
};
} // namespace

TEST(RandomFormats, MakeTheTextsThatVsnprintfMakes)
{
    for (unsigned seed = 0; seed < 40000; ++seed) {
        const random_format format(seed);
        format.compare();
        if (HasFailure()) FAIL() << "seed " << seed << ": " << format.text();
    }
}
