#include "tools/qntrace/select/where.h"

namespace qn::dump
{

bool where_expression::holds(const trace_origin &origin, const reader::trace_record &record) const
{
    bool truth = false;
    for (std::size_t i = 0; i < program_.steps.size();) {
        const auto &step = program_.steps[i++];
        switch (step.what) {
        case where_step::action::compare: truth = program_.comparisons[step.index].holds(origin, record); break;
        case where_step::action::invert: truth = !truth; break;
        case where_step::action::jump_if_true:
            if (truth) i = step.index;
            break;
        case where_step::action::jump_if_false:
            if (!truth) i = step.index;
            break;
        }
    }
    return truth;
}

} // namespace qn::dump
