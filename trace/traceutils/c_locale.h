// The "C" locale for the calling thread, so that what a byte of a text means is not up to the program's setlocale(). In a
// UTF-8 locale a pattern's "." does not match a byte that is no UTF-8, and in some a letter's other case is another one.
#pragma once

#include <locale.h>

namespace qn::tr
{
// Holds while it lives; the thread has the locale back that it had also when it is cancelled.
class c_locale
{
public:
    c_locale() : locale_(newlocale(LC_ALL_MASK, "C", nullptr)), before_(uselocale(locale_)) {}
    c_locale(const c_locale &) = delete;
    c_locale &operator=(const c_locale &) = delete;
    ~c_locale()
    {
        uselocale(before_);
        if (locale_ != nullptr) freelocale(locale_);
    }

private:
    locale_t locale_; // glibc has it ready, and allocates nothing
    locale_t before_;
};
} // namespace qn::tr
