// Registering and unregistering components: the exported calls. Global mutex.
#include <cstdlib>
#include <cstring>

#include "trace/components/component.h"
#include "trace/components/specifications.h"
#include "trace/files/debug.h"
#include "trace/files/error_report.h"
#include "trace/files/library.h"
#include "trace/files/locks.h"
#include "trace/files/trace_file.h"

namespace
{
using namespace qn::tr;

constexpr qn_uint32_t most_categories = 255;
constexpr qn_uint32_t highest_level = 255;

qn_int32_t check_category(const tr_category_description_t &category, int entry, qn_uint32_t count)
{
    const char *name = category.category_name;
    if (name == nullptr || name[0] == '\0') return set_error_int(QN_TR_ECATNAME, 5, entry);
    if (category.category_id >= count) return set_error_str(QN_TR_ECATID, 6, name);
    if (category.default_level_of_detail > highest_level) return set_error_str(QN_TR_EDEFLEVEL, 7, name);
    if (category.minimum_level_of_detail > highest_level) return set_error_str(QN_TR_EMINLEVEL, 8, name);
    return 0;
}

// Without the global mutex, so that a taken identifier is refused while the library is busy.
bool is_registered(const char *id)
{
    const mutex_lock list(component_list_mutex);
    return find_component(id) != nullptr;
}

qn_int32_t check_registration(const char *id, const tr_detail_level_t *levels,
                              const tr_category_description_t *categories, qn_uint32_t count)
{
    if (count == 0 || count > most_categories) return set_error(QN_TR_ECATCOUNT, 1);
    if (id == nullptr || id[0] == '\0') return set_error(QN_TR_ECOMPID, 2);
    if (categories == nullptr) return set_error(QN_TR_ECATLIST, 3);
    if (levels == nullptr) return set_error(QN_TR_ELEVELS, 3);
    if (is_registered(id)) return set_error(QN_TR_EINUSE, 39);
    qn_int32_t status = 0;
    for (qn_uint32_t i = 0; i < count && status == 0; ++i)
        status = check_category(categories[i], static_cast<int>(i), count);
    return status;
}

// Memory for a component, its categories and their names; null when there is none.
component_anchor_t *new_component(const tr_category_description_t *categories, qn_uint32_t count)
{
    size_t bytes = sizeof(component_anchor_t) + (count - 1) * sizeof(tr_category_description_t);
    for (qn_uint32_t i = 0; i < count; ++i) bytes += std::strlen(categories[i].category_name) + 1;
    auto *component = static_cast<component_anchor_t *>(std::calloc(1, bytes));
    if (component == nullptr) return nullptr;
    component->pFileTokens = static_cast<tr_file_token_t *>(std::calloc(count, sizeof(tr_file_token_t)));
    component->pMappedBy = static_cast<trace_map_spec_t **>(std::calloc(count, sizeof(trace_map_spec_t *)));
    if (component->pFileTokens != nullptr && component->pMappedBy != nullptr) return component;
    free_component(component);
    return nullptr;
}

// All that a component says of itself, and the levels that it begins with.
void describe_component(component_anchor_t *component, const char *id, tr_detail_level_t *levels,
                        const tr_category_description_t *categories, qn_uint32_t count)
{
    std::memcpy(component->compId, id, strnlen(id, 4));
    component->pDetailLevels = levels;
    component->numberOfCategories = static_cast<int>(count);
    for (qn_uint32_t i = 0; i < count; ++i) store_relaxed(levels[i], 0);
    char *name = reinterpret_cast<char *>(component->categories + count);
    for (qn_uint32_t i = 0; i < count; ++i) {
        const size_t bytes = std::strlen(categories[i].category_name) + 1;
        std::memcpy(name, categories[i].category_name, bytes);
        component->categories[i] = categories[i];
        component->categories[i].category_name = name;
        name += bytes;
        store_relaxed(levels[i], static_cast<tr_detail_level_t>(categories[i].minimum_level_of_detail));
    }
}

// Puts the component at the head of the list, when there is nothing of it left to write: others find it by its identifier
// from here on, and a child that another thread forks just now has the list as it is.
void link_component(component_anchor_t *component)
{
    const mutex_lock list(component_list_mutex);
    component->pNext = anchors.pFirstComp;
    anchors.pFirstComp = component;
}

// The client's trace points fall silent.
void switch_levels_off(const component_anchor_t *component)
{
    for (int i = 0; i < component->numberOfCategories; ++i) store_relaxed(component->pDetailLevels[i], 0);
}

void apply_specifications(component_anchor_t *component)
{
    for (trace_level_spec_t *spec = anchors.pFirstTraceSpec; spec != nullptr; spec = spec->pNext)
        process_trace_spec(&anchors, spec, component);
    for (trace_map_spec_t *spec = anchors.pFirstMapSpec; spec != nullptr; spec = spec->pNext)
        process_map_spec(&anchors, spec, component);
}

void stop_if_off(trace_anchor_t *anchor)
{
    if (is_trace_on(anchor)) return;
    const anchor_set_lock set(anchor);
    if (set && anchor->pMap != nullptr) stop_trace(anchor, load_relaxed(this_is_child));
}

// Holds the global mutex and the component being built; gives both up unless the registration came to its end.
class registration
{
public:
    registration() : result_(lockGlobalMutex()) {}
    registration(const registration &) = delete;
    registration &operator=(const registration &) = delete;
    ~registration()
    {
        if (result_ != 0) return;
        if (component_ != nullptr) switch_levels_off(component_);
        register_cleanup(&component_);
    }

    int result() const { return result_; }
    void building(component_anchor_t *component) { component_ = component; }
    void done() { component_ = nullptr; }

private:
    guard_mark mark_;
    int result_;
    component_anchor_t *component_ = nullptr;
};
} // namespace

void register_cleanup(void *pArg)
{
    auto *component = *static_cast<component_anchor_t **>(pArg);
    if (component != nullptr && anchors.pFirstComp == component) unlink_component(component);
    free_component(component);
    unlockGlobalMutex();
}

qn_int32_t tr_ms_register_component_1(const qn_char_t *pComponentId, tr_detail_level_t *pLevelArray,
                                      const tr_category_description_t *pCategoryDesc,
                                      const qn_uint32_t numberOfCategories, tr_file_token_t **fileTokens)
{
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    qn_int32_t status = check_registration(pComponentId, pLevelArray, pCategoryDesc, numberOfCategories);
    if (status != 0) return status;
    {
        registration in_progress;
        if (in_progress.result() != 0) return set_error_int(QN_TR_ELOCK, 9, in_progress.result());
        debug("Registering component %s\n", pComponentId);
        status = init_default_anchor();
        if (status != 0) return status;

        component_anchor_t *component = new_component(pCategoryDesc, numberOfCategories);
        if (component == nullptr) return set_error(QN_TR_ENOMEM, 14);
        in_progress.building(component);
        if (fileTokens != nullptr) *fileTokens = component->pFileTokens;
        describe_component(component, pComponentId, pLevelArray, pCategoryDesc, numberOfCategories);
        link_component(component);
        apply_specifications(component);
        status = start_traces_that_are_on();
        if (status == 0) status = check_mapped_files();
        in_progress.done();
    }
    return status != 0 ? status : cu_set_no_error_1();
}

qn_int32_t tr_register_component_1(const qn_char_t *pComponentId, tr_detail_level_t *pLevelArray,
                                   const tr_category_description_t *pCategoryDesc, const qn_uint32_t numberOfCategories)
{
    return tr_ms_register_component_1(pComponentId, pLevelArray, pCategoryDesc, numberOfCategories, nullptr);
}

qn_int32_t tr_unregister_component_1(const qn_char_t *pComponentId)
{
    if (master_override_off()) return QN_TR_ELOCK;
    if (pComponentId == nullptr || pComponentId[0] == '\0') return set_error(QN_TR_ECOMPID, 2);
    pthread_once(&trace_global_data_once, initialize_trace_global_data);
    {
        const global_lock global;
        if (!global) return set_error_int(QN_TR_ELOCK, 9, global.result());
        component_anchor_t *component = find_component(pComponentId);
        if (component == nullptr) return set_error_str(QN_TR_ENOTREGISTERED, 26, pComponentId);

        switch_levels_off(component);
        unlink_component(component);
        free_component(component);
        for (trace_anchor_t *anchor = &anchors; anchor != nullptr; anchor = load_acquire(anchor->next))
            stop_if_off(anchor);
    }
    return cu_set_no_error_1();
}
