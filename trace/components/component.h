// A registered component: its categories, where the client keeps their levels, and which files they trace to.
//
// The list of components hangs on the default anchor. It is changed with the global mutex and the component list mutex
// held; a look-up holds at least one of the two.
#pragma once

#include <qn_tr.h>

#include "trace/files/anchor.h"

// One block: the fixed part, the further categories, then the names that the categories point to.
struct component_anchor {
    component_anchor_t *pNext;
    char compId[5]; // up to four characters, NUL-padded
    char rsvd[3];
    tr_detail_level_t *pDetailLevels; // the client's array, indexed by category_id; read without a lock
    tr_file_token_t *pFileTokens;     // one per entry of categories; null: the default file
    trace_map_spec_t **pMappedBy;     // one per entry too: the last element of the file map that matched it, or null
    int numberOfCategories;
    tr_category_description_t categories[1]; // numberOfCategories of them, in the client's order
};

// Gives up the registration in progress of the component that pArg points to a pointer to, and unlocks the global mutex.
// What a cancelled registration runs.
void register_cleanup(void *pArg);

namespace qn::tr
{
// True when the identifiers agree in their first four characters, or up to a common end before that.
bool same_component_id(const char *id, const char *other);

// The component with that identifier, or null. Global mutex or component list mutex.
component_anchor_t *find_component(const char *id);

// Frees a component that is in no list; null is allowed.
void free_component(component_anchor_t *component);

// Takes a component out of the list, if it is there. Global mutex.
void unlink_component(component_anchor_t *component);

// True when any category of any component has a level above 0.
bool any_category_traces();
} // namespace qn::tr
