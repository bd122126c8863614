#include "trace/components/patterns.h"

const char matchAll[] = ".*";

namespace qn::tr
{
int scan_component_pattern(specification_text &from, size_t end, pattern_text &component)
{
    int nBrackets = 0;
    int nBraces = 0;
    const size_t start = from.at;
    for (; from.at < end; ++from.at) {
        switch (from.text[from.at]) {
        case '[': ++nBrackets; break;
        case ']': --nBrackets; break;
        case '{': ++nBraces; break;
        case '}': --nBraces; break;
        case ':':
            if (nBrackets != 0 || nBraces != 0) break;
            if (from.at == start) return set_error_int(QN_TR_ESPECCOMP, 10, static_cast<int>(from.at));
            component = {start, from.text.substr(start, from.at - start)};
            ++from.at;
            return 0;
        default: break;
        }
    }
    return set_error_int(QN_TR_ESPECSEP, 11, static_cast<int>(end));
}

int check_patterns(const pattern_pair &pair, const char *component, const char *category)
{
    if (!compiled_pattern(component))
        return set_error_int(QN_TR_ECOMPREGEX, 15, static_cast<int>(pair.component.offset));
    if (!compiled_pattern(category)) return set_error_int(QN_TR_ECATREGEX, 16, static_cast<int>(pair.category.offset));
    return 0;
}
} // namespace qn::tr
