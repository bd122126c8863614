// Filling the inserts of an error record into a text. Pure functions, no state.
//
// Each conversion is formatted on its own, from the recorded insert and by its recorded type. So a text from
// outside can ask for whatever it likes: what it gets is a recorded value, or the conversion stays as it is
// written.
#pragma once

#include <span>
#include <string>
#include <string_view>

#include <qn_cu.h>

#include "platform/cu/conversions.h"

namespace qn::cu
{
// True when every conversion makes sense and finds an insert of the type that it shows.
bool conversions_fit(const text_conversions &conversions, std::span<const cu_error_arg_t> inserts);

// `conversions` are those of `text`. May throw std::bad_alloc.
std::string fill_in(std::string_view text, const text_conversions &conversions,
                    std::span<const cu_error_arg_t> inserts);
} // namespace qn::cu
