// Short ways to what the tests of error records and messages ask again and again.
#pragma once

#include <cstdlib>
#include <memory>
#include <string>

#include <gtest/gtest.h>
#include <qn_cu.h>

struct release_error {
    void operator()(cu_error_t *error) const { cu_rel_error_1(error); }
};
using owned_error = std::unique_ptr<cu_error_t, release_error>;

// A copy of the calling thread's record.
inline owned_error present_error()
{
    cu_error_t *error = nullptr;
    EXPECT_EQ(cu_get_error_1(&error), 0);
    return owned_error(error);
}

inline std::string message_of(const cu_error_t &error)
{
    char *text = nullptr;
    EXPECT_EQ(cu_get_errmsg_1(&error, &text), 0);
    if (text == nullptr) return "no message";
    const std::string message = text;
    std::free(text);
    return message;
}

// The message of an error that is raised with just that text and those inserts.
template <typename... insert_types>
std::string message(const char *text, insert_types... inserts)
{
    EXPECT_EQ(cu_set_error_1(1, nullptr, nullptr, 1, 1, text, inserts...), 1);
    return message_of(*present_error());
}
