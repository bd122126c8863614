// The cost of a regular expression, in one pass from its start to its end. No state, no lock.
#include "trace/files/pattern_cost.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <utility>

namespace qn::tr
{
namespace
{
constexpr uint64_t most_added_items = 65536; // by repetition: the text itself may be as long as it is
constexpr uint64_t most_alternatives = 2000;
constexpr uint64_t most_optional = 500;             // and empty branches
constexpr uint64_t most_optional_beside_those = 50; // anchors and empty rounds
constexpr uint64_t most_empty_branches_beside_those = 300;
constexpr uint64_t most_anchors = 16;
constexpr uint64_t most_repeated_anchors = 4;
constexpr uint64_t most_empty_rounds = 16;
constexpr size_t most_levels = 100;

// All that a part of the expression comes to, with what repetition makes of it.
struct weight {
    uint64_t items = 0;
    uint64_t alternatives = 0;   // branches that take a character at least
    uint64_t empty_branches = 0; // those that need not
    uint64_t optional = 0;       // places that can be passed without a character
    // Of alternatives the one with the most counts: what is in two of them is never met together.
    uint64_t optional_in_one = 0;
    uint64_t anchors = 0;
    uint64_t repeated_anchors = 0; // one counts more than twice for every repetition around it
    uint64_t empty_rounds = 0;     // ways through endless repetitions of what may be empty
    bool may_be_empty = true;

    weight &operator+=(const weight &other)
    {
        items += other.items;
        alternatives += other.alternatives;
        empty_branches += other.empty_branches;
        optional += other.optional;
        optional_in_one += other.optional_in_one;
        anchors += other.anchors;
        repeated_anchors += other.repeated_anchors;
        empty_rounds += other.empty_rounds;
        may_be_empty = may_be_empty && other.may_be_empty;
        return *this;
    }
    bool is_affordable(uint64_t length) const
    {
        return items <= length + most_added_items && alternatives <= most_alternatives &&
               optional + empty_branches <= most_optional && anchors <= most_anchors &&
               repeated_anchors <= most_repeated_anchors && empty_rounds <= most_empty_rounds &&
               (anchors + empty_rounds == 0 ||
                (optional_in_one <= most_optional_beside_those && empty_branches <= most_empty_branches_beside_those));
    }
};

constexpr weight one_character = {.items = 1, .may_be_empty = false};
constexpr weight anchor = {.items = 1, .anchors = 1};

// What the C library makes of a repetition: so many copies, so many of which may be left out.
struct repetition {
    uint64_t copies;
    uint64_t optional;
    bool endless;
    bool may_be_none;
};

class estimate
{
public:
    explicit estimate(std::string_view pattern) : pattern_(pattern) {}

    bool is_affordable()
    {
        while (at_ < pattern_.size()) {
            if (!take_one()) return false;
            // Never so much that the next repetition could make the numbers overflow.
            if (!whole(levels_[level_]).is_affordable(pattern_.size())) return false;
        }
        // What is not closed is malformed, but read up to there.
        weight all;
        for (size_t i = 0; i <= level_; ++i) all += whole(levels_[i]);
        return all.is_affordable(pattern_.size());
    }

private:
    struct level {
        weight branches;                              // those that are complete
        weight before;                                // of the present branch, the parts before the last one
        weight last;                                  // which a repetition behind it is about
        uint64_t most_optional = 0, most_anchors = 0; // in one alternative among the complete branches
        bool has_empty_branch = false;
    };

    static weight present_branch(const level &of)
    {
        weight branch = of.before;
        branch += of.last;
        return branch;
    }

    // The level as if it ended here.
    static weight whole(level of)
    {
        add_branch(of, present_branch(of));
        of.branches.optional_in_one += of.most_optional;
        of.branches.anchors += of.most_anchors;
        of.branches.may_be_empty = of.has_empty_branch;
        return of.branches;
    }

    static void add_branch(level &to, weight branch)
    {
        if (branch.may_be_empty) {
            to.has_empty_branch = true;
        } else {
            to.most_optional = std::max(to.most_optional, std::exchange(branch.optional_in_one, 0));
            to.most_anchors = std::max(to.most_anchors, std::exchange(branch.anchors, 0));
        }
        to.branches += branch;
    }

    bool take_one()
    {
        const char character = pattern_[at_++];
        switch (character) {
        case '(': return open_group();
        case ')': close_group(); return true;
        case '|': next_branch(); return true;
        case '^':
        case '$': next(anchor); return true;
        case '*': repeat({1, 1, true, true}); return true;
        case '?': repeat({1, 1, false, true}); return true;
        case '+': repeat({2, 1, true, false}); return true;
        case '{': take_interval(); return true;
        case '[': skip_bracket(); break;
        case '\\': return take_escape();
        default: break;
        }
        next(one_character);
        return true;
    }

    void next(const weight &part)
    {
        level &now = levels_[level_];
        now.before += now.last;
        now.last = part;
    }

    void next_branch()
    {
        level &now = levels_[level_];
        weight branch = present_branch(now);
        ++(branch.may_be_empty ? branch.empty_branches : branch.alternatives);
        add_branch(now, branch);
        now.before = now.last = {};
    }

    bool open_group()
    {
        if (level_ + 1 == levels_.size()) return false;
        next({});
        levels_[++level_] = {};
        return true;
    }

    void close_group()
    {
        if (level_ == 0) return next(one_character); // stands for itself
        weight group = whole(levels_[level_]);
        if (group.may_be_empty) {
            ++group.optional;
            ++group.optional_in_one;
        }
        levels_[--level_].last = group;
    }

    void repeat(const repetition &how)
    {
        weight &last = levels_[level_].last;
        const uint64_t copies = std::max<uint64_t>(how.copies, 1);
        last.empty_rounds *= copies;
        if (how.endless && last.may_be_empty) last.empty_rounds = 2 * last.empty_rounds + (last.optional + 1) * copies;
        last.may_be_empty = last.may_be_empty || how.may_be_none;
        last.items *= copies;
        last.alternatives *= copies;
        last.empty_branches *= copies;
        last.optional = last.optional * copies + how.optional;
        last.optional_in_one = last.optional_in_one * copies + how.optional;
        last.repeated_anchors = 2 * copies * (last.repeated_anchors + last.anchors);
        last.anchors *= copies;
    }

    // "{n}", "{n,}", "{n,m}" or "{,m}"; another "{" stands for itself, or is malformed.
    void take_interval()
    {
        size_t at = at_;
        const uint64_t least = take_number(at);
        uint64_t most = least;
        bool endless = false;
        if (at < pattern_.size() && pattern_[at] == ',') {
            ++at;
            const size_t start = at;
            most = take_number(at);
            endless = at == start;
        }
        if (at == at_ || at == pattern_.size() || pattern_[at] != '}') return next(one_character);
        at_ = at + 1;
        const bool may_be_none = least == 0;
        if (endless)
            repeat({least + 1, 1, true, may_be_none});
        else
            repeat({std::max(least, most), most > least ? most - least : 0, false, may_be_none});
    }

    uint64_t take_number(size_t &at) const
    {
        constexpr uint64_t beyond_all = 100000;
        uint64_t number = 0;
        for (; at < pattern_.size() && pattern_[at] >= '0' && pattern_[at] <= '9'; ++at)
            number = std::min(beyond_all, 10 * number + static_cast<uint64_t>(pattern_[at] - '0'));
        return number;
    }

    // Behind the "[" up to and with its "]"; what has none is malformed, from there to its end.
    void skip_bracket()
    {
        if (at_ < pattern_.size() && pattern_[at_] == '^') ++at_;
        if (at_ < pattern_.size() && pattern_[at_] == ']') ++at_;
        while (at_ < pattern_.size()) {
            const char character = pattern_[at_++];
            if (character == ']') return;
            if (character != '[' || at_ == pattern_.size()) continue;
            const char kind = pattern_[at_];
            if (kind != ':' && kind != '.' && kind != '=') continue;
            const char closing[] = {kind, ']'};
            const size_t end = pattern_.find(std::string_view(closing, 2), at_ + 1);
            at_ = end == std::string_view::npos ? pattern_.size() : end + 2;
        }
    }

    bool take_escape()
    {
        if (at_ == pattern_.size()) return true;
        const char character = pattern_[at_++];
        if (character >= '1' && character <= '9') return false;
        constexpr std::string_view anchors = "bB<>`'";
        next(anchors.find(character) != std::string_view::npos ? anchor : one_character);
        return true;
    }

    std::string_view pattern_;
    size_t at_ = 0;
    std::array<level, most_levels + 1> levels_{};
    size_t level_ = 0;
};
} // namespace

bool is_affordable(std::string_view pattern) { return estimate(pattern).is_affordable(); }
} // namespace qn::tr
