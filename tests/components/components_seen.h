// Clients with categories of a test's own choice, and the registered components as the library holds them.
#pragma once

#include <cstdlib>
#include <string>
#include <vector>

#include "support/last_error.h"
#include "trace/trace.h"

namespace qn::test
{
// A client whose categories are given in full.
inline client client_with(const char *id, const std::vector<tr_category_description_t> &categories)
{
    client made(id, static_cast<qn_uint32_t>(categories.size()));
    made.categories = categories;
    return made;
}

using levels = std::vector<tr_detail_level_t>;

inline component_anchor_t *registered(const std::string &id)
{
    component_anchor_t *component = anchors.pFirstComp;
    while (component != nullptr && id != component->compId) component = component->pNext;
    return component;
}

// Identifiers in list order.
inline std::vector<std::string> registered_ids()
{
    std::vector<std::string> ids;
    for (const component_anchor_t *component = anchors.pFirstComp; component != nullptr; component = component->pNext)
        ids.emplace_back(component->compId);
    return ids;
}

// The elements of a level specification, as the parser appends them; freed with the list.
struct level_list {
    trace_level_spec_t *first = nullptr;
    trace_level_spec_t *last = nullptr;

    level_list() = default;
    level_list(const level_list &) = delete;
    level_list &operator=(const level_list &) = delete;
    ~level_list()
    {
        while (first != nullptr) {
            trace_level_spec_t *next = first->pNext;
            std::free(first);
            first = next;
        }
    }
    int parse(const std::string &text) { return parse_trace_spec(text.c_str(), &first, &last); }
};

struct map_list {
    trace_map_spec_t *first = nullptr;
    trace_map_spec_t *last = nullptr;

    map_list() = default;
    map_list(const map_list &) = delete;
    map_list &operator=(const map_list &) = delete;
    ~map_list()
    {
        while (first != nullptr) {
            trace_map_spec_t *next = first->pNext;
            std::free(first);
            first = next;
        }
    }
    int parse(const std::string &text) { return parse_map_spec(text.c_str(), &first, &last); }
    int select(const std::string &selection, const char *file = "/tmp/never.trc")
    {
        return tr_set_file_map_chain(file, selection.c_str(), &first, &last);
    }
};

// True when the links lead from first to last and back, over the same nodes.
template <class Node>
bool is_well_linked(const Node *first, const Node *last)
{
    if (first == nullptr || last == nullptr) return first == last;
    if (first->pPrev != nullptr || last->pNext != nullptr) return false;
    const Node *node = first;
    for (; node->pNext != nullptr; node = node->pNext)
        if (node->pNext->pPrev != node) return false;
    return node == last;
}

template <class Node>
size_t count_of(const Node *first)
{
    size_t count = 0;
    for (; first != nullptr; first = first->pNext) ++count;
    return count;
}
} // namespace qn::test
