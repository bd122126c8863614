// One component, once as a client of the library and once as the model keeps it.
#pragma once

#include "components/components_seen.h"
#include "components/level_model.h"

namespace qn::test
{
struct twin {
    explicit twin(const char *id, const std::vector<model_category> &categories)
        : model{id, categories, levels(categories.size(), 0)}
    {
        for (size_t i = 0; i < categories.size(); ++i)
            model.levels[i] = static_cast<uint8_t>(categories[i].minimum); // by position
        for (const model_category &category : model.categories)
            real.categories.push_back({category.id, category.name.c_str(), category.standard, category.minimum});
        real.id = id;
        real.levels = levels(categories.size(), 0xEE);
    }
    twin(const twin &) = delete;
    twin &operator=(const twin &) = delete;

    model_component model;
    client real{"", 0};
};
} // namespace qn::test
