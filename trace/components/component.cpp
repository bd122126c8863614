// The component list: look-up, removal, and what it says about tracing.
#include "trace/components/component.h"

#include <cstdlib>
#include <cstring>

#include "trace/files/locks.h"
#include "trace/files/shared_words.h"

namespace qn::tr
{
bool same_component_id(const char *id, const char *other) { return std::strncmp(id, other, 4) == 0; }

component_anchor_t *find_component(const char *id)
{
    component_anchor_t *component = anchors.pFirstComp;
    while (component != nullptr && !same_component_id(component->compId, id)) component = component->pNext;
    return component;
}

void free_component(component_anchor_t *component)
{
    if (component == nullptr) return;
    std::free(component->pFileTokens);
    std::free(component->pMappedBy);
    std::free(component);
}

void unlink_component(component_anchor_t *component)
{
    const mutex_lock list(component_list_mutex);
    component_anchor_t **link = &anchors.pFirstComp;
    while (*link != nullptr && *link != component) link = &(*link)->pNext;
    if (*link != nullptr) *link = component->pNext;
}

bool any_category_traces()
{
    const mutex_lock list(component_list_mutex);
    for (const component_anchor_t *component = anchors.pFirstComp; component != nullptr; component = component->pNext)
        for (int i = 0; i < component->numberOfCategories; ++i)
            if (load_relaxed(component->pDetailLevels[i]) != 0) return true;
    return false;
}
} // namespace qn::tr
