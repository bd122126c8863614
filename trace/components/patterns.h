// What level and file map specifications share: a pair of patterns, read from text, kept in a list, applied to
// components. Global mutex, held by every caller.
#pragma once

#include <cstdlib>
#include <cstring>
#include <new>
#include <optional>
#include <string_view>

#include "trace/components/component.h"
#include "trace/files/compiled_pattern.h"
#include "trace/files/error_report.h"

extern const char matchAll[]; // what a lone "*" stands for

namespace qn::tr
{
// A position in a specification, and what its messages count offsets from.
struct specification_text {
    std::string_view text;
    size_t at = 0;

    bool at_end(size_t end) const { return at >= end; }
    void skip_blanks(size_t end)
    {
        while (at < end && text[at] == ' ') ++at;
    }
};

// A pattern as it stands in the specification.
struct pattern_text {
    size_t offset = 0;
    std::string_view characters;
};

struct pattern_pair {
    pattern_text component;
    pattern_text category;
};

// Reads "component-pattern:" of the element that ends at `end`: up to the first ":" outside bracket and brace groups.
// Leaves `from` behind the ":". 0 or a recorded error.
int scan_component_pattern(specification_text &from, size_t end, pattern_text &component);

// 0 when both patterns are regular expressions, else a recorded error at the offset of the one that is not.
int check_patterns(const pattern_pair &pair, const char *component, const char *category);

// Frees what was appended to a list behind `last_before` (null: the list was empty).
template <class Node>
void roll_back(Node *&first, Node *&last, Node *last_before)
{
    Node *node = last_before != nullptr ? last_before->pNext : first;
    if (last_before != nullptr)
        last_before->pNext = nullptr;
    else
        first = nullptr;
    last = last_before;
    while (node != nullptr) {
        Node *next = node->pNext;
        std::free(node);
        node = next;
    }
}

// Rolls a list back to what it was, unless the change came to its end.
template <class Node>
class list_change
{
public:
    list_change(Node *&first, Node *&last) : first_(first), last_(last), last_before_(last) {}
    list_change(const list_change &) = delete;
    list_change &operator=(const list_change &) = delete;
    ~list_change()
    {
        if (!done_) roll_back(first_, last_, last_before_);
    }
    void done() { done_ = true; }

private:
    Node *&first_;
    Node *&last_;
    Node *last_before_;
    bool done_ = false;
};

// Appends a node for a pair of patterns, in one block with its two strings, and checks that they compile. 0 or a
// recorded error; the node is in the list either way, for the roll-back to find.
template <class Node>
int append_pair(Node *&first, Node *&last, const pattern_pair &pair)
{
    const std::string_view component = pair.component.characters == "*" ? matchAll : pair.component.characters;
    const std::string_view category = pair.category.characters == "*" ? matchAll : pair.category.characters;
    void *block = std::calloc(1, sizeof(Node) + component.size() + 1 + category.size() + 1);
    if (block == nullptr) return set_error(QN_TR_ENOMEM, 14);

    auto *node = new (block) Node{};
    node->pCompId = static_cast<char *>(block) + sizeof(Node);
    node->pCategory = node->pCompId + component.size() + 1;
    std::memcpy(node->pCompId, component.data(), component.size());
    std::memcpy(node->pCategory, category.data(), category.size());
    node->pPrev = last;
    if (last != nullptr)
        last->pNext = node;
    else
        first = node;
    last = node;
    return check_patterns(pair, node->pCompId, node->pCategory);
}

// Calls apply(component, i) for every category i that a node's patterns match, of all components on the anchor's list or
// of `target` alone, which is on that list. Patterns that do not compile match nothing: the result is false. Compiling is
// most of the work: the pattern for categories is compiled when a component matches, which of many specifications most do
// not.
template <class Node, class Apply>
bool for_each_match(const trace_anchor_t *anchor, const Node *node, component_anchor_t *target, Apply apply)
{
    const compiled_pattern component_pattern(node->pCompId);
    if (!component_pattern) return false;
    std::optional<compiled_pattern> category_pattern;
    for (component_anchor_t *component = target != nullptr ? target : anchor->pFirstComp; component != nullptr;
         component = target != nullptr ? nullptr : component->pNext) {
        if (!component_pattern.matches(component->compId)) continue;
        if (!category_pattern) category_pattern.emplace(node->pCategory);
        if (!*category_pattern) return false;
        for (int i = 0; i < component->numberOfCategories; ++i)
            if (category_pattern->matches(component->categories[i].category_name)) apply(component, i);
    }
    return true;
}
} // namespace qn::tr
