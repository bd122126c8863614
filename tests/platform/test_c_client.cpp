// The libraries through their shared objects and a C program's eyes.
#include <ctime>

#include <gtest/gtest.h>

extern "C" {
int c_client_error_text(const char *expected);
int c_client_time(double *seconds);
int c_client_failure(char *text, int size);
int register_nothing(void);
}

TEST(CClient, RaisesAnErrorAndReadsItsMessage) { EXPECT_EQ(c_client_error_text("disk has 3 of 40"), 0); }

TEST(CClient, TellsTheTimeOfACounterValue)
{
    const auto before = static_cast<double>(std::time(nullptr)) - 2;
    double seconds = 0;
    ASSERT_EQ(c_client_time(&seconds), 0);
    EXPECT_GT(seconds, before);
    EXPECT_LT(seconds, static_cast<double>(std::time(nullptr)) + 2);
}

TEST(CClient, BuildsTheTextOfAFailureWithItsFields)
{
    char text[100];
    EXPECT_EQ(c_client_failure(text, sizeof text), 41);
    EXPECT_STREQ(text, "A C program failed. [C_CLIENT_ER] code=-9");
}

TEST(CClient, RegistersAProxyTable) { EXPECT_EQ(register_nothing(), 0); }
