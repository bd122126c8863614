// What the C library gave, given back with its scope: std::unique_ptr<FILE, releases<std::fclose>>.
#pragma once

namespace qn::tr
{
template <auto release>
struct releases {
    template <typename type>
    void operator()(type *what) const
    {
        release(what);
    }
};
} // namespace qn::tr
