// Random filter expressions over random records: the command's evaluator against one that walks the tree of which the
// expression was written, and that knows the records from how they were made.
#include <gtest/gtest.h>

#include <algorithm>
#include <memory>
#include <optional>
#include <random>
#include <string>
#include <vector>

#include "reader/select_reading.h"
#include "tools/qntrace/select/where_error.h"

namespace qn::test
{
namespace
{

using randomness = std::mt19937;

std::size_t below(randomness &random, std::size_t limit)
{
    return std::uniform_int_distribution<std::size_t>(0, limit - 1)(random);
}

template <typename T>
const T &one_of(randomness &random, const std::vector<T> &choices)
{
    return choices[below(random, choices.size())];
}

// Few of each, so that conditions hold often.
const std::vector<std::string> components = {"A", "IDX", "LONG"};
const std::vector<std::string> texts = {"", "a", "error 5", "an error", "ERR"};
const std::vector<std::int64_t> numbers = {-3, -1, 0, 1, 2, 3, 7};

struct record_made {
    std::string comp;
    std::string kind;
    std::optional<std::int64_t> id;
    std::int64_t seq = 0;
    std::int64_t thread = 0;
    std::vector<std::int64_t> values;
    std::vector<std::string> strings;
};

class file_made
{
public:
    explicit file_made(randomness &random)
    {
        for (int i = 0; i < 60; ++i) {
            add(random);
        }
        file.close();
    }

    trace_builder file{1 << 14};
    std::vector<record_made> records;

private:
    void add(randomness &random)
    {
        record_made made;
        made.comp = one_of(random, components);
        made.thread = static_cast<std::int64_t>(below(random, 4));
        const bool has_id = below(random, 4) != 0;
        if (has_id) made.id = static_cast<std::int64_t>(below(random, 8));
        const auto id = has_id ? static_cast<std::uint32_t>(*made.id) : 0xFFFFFFFF;
        const auto count = below(random, 4);
        file.component = made.comp;
        file.thread = static_cast<std::uint32_t>(made.thread);
        made.kind = one_of<std::string>(random, {"id", "values32", "values64", "strings"});
        for (std::size_t i = 0; i < count; ++i) {
            if (made.kind == "strings") made.strings.push_back(one_of(random, texts));
            if (made.kind.starts_with("values")) made.values.push_back(one_of(random, numbers));
        }
        if (made.kind == "id") file.add_id(id);
        if (made.kind == "strings") file.add_strings(id, made.strings);
        if (made.kind.starts_with("values")) {
            auto body = file.body().u32(id).u32(static_cast<std::uint32_t>(count));
            for (const auto value : made.values) {
                if (made.kind == "values32") body.u32(static_cast<std::uint32_t>(value));
                if (made.kind == "values64") body.u64(static_cast<std::uint64_t>(value));
            }
            file.add(made.kind == "values32" ? 12 : 13, body);
        }
        made.seq = static_cast<std::int64_t>(file.seq);
        records.push_back(made);
    }
};

// A node of an expression's tree.
class node
{
public:
    virtual ~node() = default;
    virtual bool holds(const record_made &record) const = 0;
    virtual std::string text() const = 0;
    virtual int rank() const = 0; // how tightly it binds: || 1, && 2, ! and parts 3
};

std::string in_parentheses(const std::string &text) { return "(" + text + ")"; }

class comparison_of_numbers final : public node
{
public:
    explicit comparison_of_numbers(randomness &random)
        : field_(one_of<std::string>(random, {"id", "seq", "thread", "value"})),
          operation_(one_of<std::string>(random, {"==", "!=", "<", "<=", ">", ">=", "in"})),
          number_(one_of(random, numbers)), other_(one_of(random, numbers)), turned_(below(random, 4) == 0)
    {
    }

    int rank() const override { return 3; }

    std::string text() const override
    {
        const auto number = std::to_string(number_);
        if (operation_ == "in") return field_ + " in (" + number + ", " + std::to_string(other_) + ")";
        if (!turned_) return field_ + " " + operation_ + " " + number;
        std::string mirrored = operation_;
        if (mirrored[0] == '<' || mirrored[0] == '>') mirrored[0] = mirrored[0] == '<' ? '>' : '<';
        return number + " " + mirrored + " " + field_;
    }

    bool holds(const record_made &record) const override
    {
        std::vector<std::int64_t> candidates;
        if (field_ == "id" && record.id) candidates = {*record.id};
        if (field_ == "seq") candidates = {record.seq};
        if (field_ == "thread") candidates = {record.thread};
        if (field_ == "value") candidates = record.values;
        const auto any = [&](const auto &test) { return std::any_of(candidates.begin(), candidates.end(), test); };
        if (operation_ == "==") return any([this](auto n) { return n == number_; });
        if (operation_ == "!=") return !any([this](auto n) { return n == number_; });
        if (operation_ == "<") return any([this](auto n) { return n < number_; });
        if (operation_ == "<=") return any([this](auto n) { return n <= number_; });
        if (operation_ == ">") return any([this](auto n) { return n > number_; });
        if (operation_ == ">=") return any([this](auto n) { return n >= number_; });
        return any([this](auto n) { return n == number_ || n == other_; });
    }

private:
    std::string field_;
    std::string operation_;
    std::int64_t number_;
    std::int64_t other_; // of a list
    bool turned_;
};

class comparison_of_texts final : public node
{
public:
    explicit comparison_of_texts(randomness &random)
        : field_(one_of<std::string>(random, {"comp", "text"})),
          operation_(one_of<std::string>(random, {"==", "!=", "=~", "!~"})),
          text_(one_of(random, field_ == "comp" ? components : texts)), from_begin_(below(random, 2) == 0),
          to_end_(below(random, 2) == 0)
    {
    }

    int rank() const override { return 3; }

    std::string text() const override
    {
        const bool matches = operation_[1] == '~';
        return field_ + operation_ + '"' + (matches && from_begin_ ? "^" : "") + text_ +
               (matches && to_end_ ? "$" : "") + '"';
    }

    bool holds(const record_made &record) const override
    {
        const auto candidates = field_ == "comp" ? std::vector{record.comp} : record.strings;
        const bool any = std::any_of(candidates.begin(), candidates.end(), [this](const auto &t) { return fits(t); });
        return any == (operation_[0] == '=');
    }

private:
    bool fits(const std::string &candidate) const
    {
        if (operation_[1] == '=' || (from_begin_ && to_end_)) return candidate == text_;
        if (from_begin_) return candidate.starts_with(text_);
        if (to_end_) return candidate.ends_with(text_);
        return candidate.find(text_) != std::string::npos;
    }

    std::string field_;
    std::string operation_;
    std::string text_;
    bool from_begin_;
    bool to_end_;
};

class inversion final : public node
{
public:
    inversion(std::unique_ptr<node> part) : part_(std::move(part)) {}
    int rank() const override { return 3; }
    std::string text() const override
    {
        const auto text = part_->text();
        const bool is_inversion = part_->rank() == 3 && text.starts_with('!');
        return "!" + (is_inversion ? text : in_parentheses(text));
    }
    bool holds(const record_made &record) const override { return !part_->holds(record); }

private:
    std::unique_ptr<node> part_;
};

class junction final : public node
{
public:
    junction(bool both, bool generous, std::vector<std::unique_ptr<node>> parts)
        : both_(both), generous_(generous), parts_(std::move(parts))
    {
    }

    int rank() const override { return both_ ? 2 : 1; }

    std::string text() const override
    {
        std::string result;
        for (const auto &part : parts_) {
            if (!result.empty()) result += both_ ? "&&" : " || ";
            result += generous_ || part->rank() < rank() ? in_parentheses(part->text()) : part->text();
        }
        return result;
    }

    bool holds(const record_made &record) const override
    {
        const auto test = [&](const auto &part) { return part->holds(record); };
        return both_ ? std::all_of(parts_.begin(), parts_.end(), test)
                     : std::any_of(parts_.begin(), parts_.end(), test);
    }

private:
    bool both_;
    bool generous_; // with parentheses
    std::vector<std::unique_ptr<node>> parts_;
};

std::unique_ptr<node> random_node(randomness &random, int depth)
{
    const auto choice = depth == 0 ? 0 : below(random, 8);
    if (choice < 2) {
        if (below(random, 2) == 0) return std::make_unique<comparison_of_numbers>(random);
        return std::make_unique<comparison_of_texts>(random);
    }
    if (choice < 4) return std::make_unique<inversion>(random_node(random, depth - 1));
    std::vector<std::unique_ptr<node>> parts;
    const auto count = 2 + below(random, 3);
    for (std::size_t i = 0; i < count; ++i) {
        parts.push_back(random_node(random, depth - 1));
    }
    return std::make_unique<junction>(choice < 6, below(random, 3) == 0, std::move(parts));
}

TEST(WhereAtRandom, EveryExpressionSelectsWhatItsTreeSelects)
{
    randomness random(20261121);
    std::size_t passed = 0;
    std::size_t stopped = 0;
    for (int round = 0; round < 50; ++round) {
        const file_made made(random);
        for (int i = 0; i < 60; ++i) {
            const auto tree = random_node(random, 5);
            const auto text = tree->text();
            seqs expected;
            for (const auto &record : made.records) {
                if (tree->holds(record)) expected.push_back(static_cast<std::uint32_t>(record.seq));
            }
            ASSERT_EQ(seqs_where(made.file, "kind != \"free\" && (" + text + ")"), expected) << text;
            passed += expected.size();
            stopped += made.records.size() - expected.size();
        }
    }
    // The expressions are no mere constants.
    EXPECT_GT(passed, 20'000U);
    EXPECT_GT(stopped, 20'000U);
}

TEST(WhereAtRandom, AnyRowOfTokensIsTakenOrRefusedAtAColumnOfIt)
{
    const std::vector<std::string> tokens = {"id",   "comp",  "text",    "time",  "in", "nothing", "3",  "-1",
                                             "0xff", "\"a\"", "\"-1h\"", "==",    "!=", "<",       ">=", "=~",
                                             "!~",   "&&",    "||",      "!",     "(",  ")",       ",",  "\"",
                                             "=",    "&",     "'",       "\"(\"", "9z", "\xc3\xa9"};
    randomness random(5);
    std::size_t taken = 0;
    std::size_t refused = 0;
    for (int i = 0; i < 20'000; ++i) {
        std::string text = "id == 3";
        for (auto left = below(random, 8); left > 0; --left) {
            text += " " + one_of(random, tokens);
        }
        try {
            const dump::where_expression parsed(text, test_now);
            ++taken;
        } catch (const dump::where_error &error) {
            ASSERT_GE(error.column(), 1u) << text;
            ASSERT_LE(error.column(), text.size() + 1) << text;
            ++refused;
        }
    }
    EXPECT_GT(taken, 1000u);
    EXPECT_GT(refused, 1000u);
}

} // namespace
} // namespace qn::test
