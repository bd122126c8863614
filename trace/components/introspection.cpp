// Snapshots of the registered components. Global mutex.
#include <cstdlib>
#include <cstring>

#include "trace/components/component.h"
#include "trace/files/locks.h"

namespace
{
using namespace qn::tr;

int count_components()
{
    int count = 0;
    for (const component_anchor_t *component = anchors.pFirstComp; component != nullptr; component = component->pNext)
        ++count;
    return count;
}

// Fills a zeroed copy; false when memory runs out. What was filled by then can be released.
bool copy_component(const component_anchor_t *component, tr_mini_component_anchor_t &copy)
{
    const auto count = static_cast<size_t>(component->numberOfCategories);
    copy.categories = static_cast<tr_category_description_t *>(std::calloc(count, sizeof(tr_category_description_t)));
    if (copy.categories == nullptr) return false;
    copy.numberOfCategories = component->numberOfCategories;
    std::memcpy(copy.compId, component->compId, sizeof copy.compId);
    copy.pDetailLevels = static_cast<tr_detail_level_t *>(std::malloc(count));
    if (copy.pDetailLevels == nullptr) return false;
    for (size_t i = 0; i < count; ++i) {
        copy.pDetailLevels[i] = load_relaxed(component->pDetailLevels[i]);
        copy.categories[i].category_id = component->categories[i].category_id;
        copy.categories[i].category_name = strdup(component->categories[i].category_name);
        if (copy.categories[i].category_name == nullptr) return false;
    }
    return true;
}
} // namespace

int tr_get_current_trace_levels_1(int *componentCount, tr_mini_component_anchor_t **components)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    global_lock_that_may_stay global;
    const int count = count_components();
    auto *snapshot = static_cast<tr_mini_component_anchor_t *>(
        std::calloc(count > 0 ? static_cast<size_t>(count) : 1, sizeof(tr_mini_component_anchor_t)));
    *components = snapshot;
    if (snapshot == nullptr) {
        global.stay(); // that is the documented behaviour of the call
        return -1;
    }
    *componentCount = count;

    const component_anchor_t *component = anchors.pFirstComp;
    for (int i = 0; i < count; ++i, component = component->pNext) {
        if (copy_component(component, snapshot[i])) continue;
        tr_release_comp_info_1(count, snapshot);
        *components = nullptr;
        global.stay();
        return -1;
    }
    return 0;
}

void tr_release_comp_info_1(const int componentCount, tr_mini_component_anchor_t *components)
{
    if (components == nullptr || componentCount == 0) return;
    for (int i = 0; i < componentCount; ++i) {
        std::free(components[i].pDetailLevels);
        for (int category = 0; category < components[i].numberOfCategories; ++category)
            std::free(const_cast<qn_char_t *>(components[i].categories[category].category_name));
        std::free(components[i].categories);
    }
    std::free(components);
}
