// Specifications from the value of QN_TR_SPOOL.
#include <ostream>

#include <gtest/gtest.h>

#include "spooling/spool_support.h"

namespace
{
using namespace qn::test;

struct found {
    std::string pattern;
    qn_int32_t onoff;
    qn_uint32_t pages;
    std::string dest;
    bool operator==(const found &) const = default;
};

std::ostream &operator<<(std::ostream &out, const found &spec)
{
    return out << spec.pattern << ':' << spec.onoff << ':' << spec.pages << ':' << spec.dest;
}

struct reading {
    const char *value;
    qn_int32_t status;
    std::vector<found> specs;
};

void PrintTo(const reading &given, std::ostream *out) { *out << '"' << given.value << '"'; }

class EnvironmentSource : public testing::Test
{
protected:
    qn_int32_t parse(const std::string &value) { return parse_spool_spec(value.c_str(), &list.first, &list.last); }
    std::vector<found> read() const
    {
        std::vector<found> specs;
        for (const trace_spool_spec_t *spec : list.all())
            specs.push_back({spec->pattern, spec->onoff, spec->pages, spec->dest});
        return specs;
    }

    specifications list;
};

class SpoolValue : public EnvironmentSource, public testing::WithParamInterface<reading>
{
};

TEST_P(SpoolValue, IsReadAsItIsWritten)
{
    EXPECT_EQ(parse(GetParam().value), GetParam().status);
    EXPECT_EQ(read(), GetParam().specs);
}

constexpr qn_int32_t some_on = 40;
constexpr qn_int32_t none_on = 41;
constexpr qn_int32_t faulty = 39;

INSTANTIATE_TEST_SUITE_P(
    Whole, SpoolValue,
    testing::Values(reading{"", none_on, {}}, reading{"p:ON:9:/d", some_on, {{"p", 1, 9, "/d"}}},
                    reading{"p:OFF:9:/d", none_on, {{"p", 0, 9, "/d"}}},
                    reading{"trace.*:ON:4:/var/spool/t,other.*:OFF:10:/tmp/x:5242880",
                            some_on,
                            {{"trace.*", 1, 8, "/var/spool/t"}, {"other.*", 0, 20, "/tmp/x"}}},
                    reading{"a:OFF:9:/d,b:ON:9:/e", some_on, {{"a", 0, 9, "/d"}, {"b", 1, 9, "/e"}}},
                    reading{"a:OFF:9:/d,b:OFF:9:/e", none_on, {{"a", 0, 9, "/d"}, {"b", 0, 9, "/e"}}},
                    reading{"a:ON:9:/d,", some_on, {{"a", 1, 9, "/d"}}}));

// A pattern goes to the first ":", commas and blanks included.
INSTANTIATE_TEST_SUITE_P(
    Patterns, SpoolValue,
    testing::Values(reading{",p:ON:9:/d", some_on, {{",p", 1, 9, "/d"}}},
                    reading{"p,q:ON:9:/d", some_on, {{"p,q", 1, 9, "/d"}}},
                    reading{" p :ON:9: /d ", some_on, {{" p ", 1, 9, " /d "}}},
                    reading{"a:ON:9:/d,,b:ON:9:/e", some_on, {{"a", 1, 9, "/d"}, {",b", 1, 9, "/e"}}}));

INSTANTIATE_TEST_SUITE_P(Switch, SpoolValue,
                         testing::Values(reading{"p:On:9:/d", some_on, {{"p", 1, 9, "/d"}}},
                                         reading{"p:on:9:/d", some_on, {{"p", 1, 9, "/d"}}},
                                         reading{"p:oFf:9:/d", none_on, {{"p", 0, 9, "/d"}}},
                                         reading{"p:YES:3:/d", faulty, {}}, reading{"p:O:3:/d", faulty, {}},
                                         reading{"p:NO:3:/d", faulty, {}}, reading{"p:OF:3:/d", faulty, {}},
                                         reading{"p:ONN:3:/d", faulty, {}}, reading{"p:OFFF:3:/d", faulty, {}},
                                         reading{"p: ON:3:/d", faulty, {}}, reading{"p:1:3:/d", faulty, {}},
                                         reading{"p::3:/d", faulty, {}}));

INSTANTIATE_TEST_SUITE_P(Pages, SpoolValue,
                         testing::Values(reading{"p:ON:100:/d", some_on, {{"p", 1, 100, "/d"}}},
                                         reading{"p:ON:8:/d", some_on, {{"p", 1, 8, "/d"}}},
                                         reading{"p:ON:7:/d", some_on, {{"p", 1, 8, "/d"}}},
                                         reading{"p:ON:0:/d", some_on, {{"p", 1, 8, "/d"}}},
                                         reading{"p:ON:x:/d", some_on, {{"p", 1, 8, "/d"}}},
                                         reading{"p:ON:12x:/d", some_on, {{"p", 1, 12, "/d"}}},
                                         reading{"p:ON: 12:/d", some_on, {{"p", 1, 12, "/d"}}},
                                         reading{"p:ON::/d", faulty, {}}));

INSTANTIATE_TEST_SUITE_P(
    TraceSize, SpoolValue,
    testing::Values(reading{"p:ON:100:/d:1048576", some_on, {{"p", 1, 8, "/d"}}},
                    reading{"p:ON:1:/d:5242880", some_on, {{"p", 1, 20, "/d"}}},
                    reading{"p:ON:1:/d:2097151", some_on, {{"p", 1, 8, "/d"}}},
                    reading{"p:ON:1:/d:2097152", some_on, {{"p", 1, 8, "/d"}}},
                    reading{"p:ON:1:/d:2359295", some_on, {{"p", 1, 8, "/d"}}},
                    reading{"p:ON:1:/d:2359296", some_on, {{"p", 1, 9, "/d"}}},
                    reading{"p:ON:12:/d:", some_on, {{"p", 1, 12, "/d"}}},
                    reading{"p:ON:12:/d:0", some_on, {{"p", 1, 12, "/d"}}},
                    reading{"p:ON:12:/d:x", some_on, {{"p", 1, 12, "/d"}}},
                    reading{"p:ON:12:/d:5242880:9", some_on, {{"p", 1, 20, "/d"}}},
                    reading{"p:ON:12:/d:5242880k,q:ON:9:/e", some_on, {{"p", 1, 20, "/d"}, {"q", 1, 9, "/e"}}}));

// A destination may be missing behind a specification's ":" as before a size's, and neither is one.
INSTANTIATE_TEST_SUITE_P(Unfinished, SpoolValue,
                         testing::Values(reading{"p", faulty, {}}, reading{"p:", faulty, {}},
                                         reading{"p:ON", faulty, {}}, reading{"p:ON:", faulty, {}},
                                         reading{"p:ON:3", faulty, {}}, reading{"p:ON:3:", faulty, {}},
                                         reading{"p:ON:3:,q:ON:9:/e", faulty, {}},
                                         reading{"p:ON:3::5242880", faulty, {}}, reading{"p:ON:3::", faulty, {}},
                                         reading{":ON:3:/d", faulty, {}}, reading{":", faulty, {}},
                                         reading{",", faulty, {}}));

INSTANTIATE_TEST_SUITE_P(Fault, SpoolValue,
                         testing::Values(reading{"a:ON:9:/d,b:YES:9:/e,c:ON:9:/f", faulty, {{"a", 1, 9, "/d"}}},
                                         reading{"a:OFF:9:/d,b", faulty, {{"a", 0, 9, "/d"}}},
                                         reading{"a:ON:9:/d,,", faulty, {{"a", 1, 9, "/d"}}}));

TEST_F(EnvironmentSource, SyncsEveryMinuteAndHasPagesOfOneSize)
{
    ASSERT_EQ(parse("a:ON:9:/d,b:OFF:1:/e:5242880"), some_on);
    for (const trace_spool_spec_t *spec : list.all()) {
        EXPECT_EQ(spec->sync_interval, 60U);
        EXPECT_EQ(spec->pg_size, 262144U);
        EXPECT_EQ(spec->isDefaultSpec, 0);
    }
}

TEST_F(EnvironmentSource, AppendsToWhatIsThere)
{
    list.add("before");
    ASSERT_EQ(parse("a:ON:9:/d"), some_on);
    EXPECT_EQ(list.patterns(), (std::vector<std::string>{"before", "a"}));
}

TEST_F(EnvironmentSource, TakesTheLongestPattern)
{
    const std::string pattern(1023, 'p');
    EXPECT_EQ(parse(pattern + ":ON:9:/d"), some_on);
    EXPECT_EQ(list.patterns(), std::vector<std::string>{pattern});
}

TEST_F(EnvironmentSource, RefusesALongerPattern)
{
    EXPECT_EQ(parse("a:ON:9:/d," + std::string(1024, 'p') + ":ON:9:/d"), faulty);
    EXPECT_EQ(list.patterns(), std::vector<std::string>{"a"});
}

TEST_F(EnvironmentSource, CutsALongDestination)
{
    const std::string dest = "/" + std::string(5000, 'd');
    EXPECT_EQ(parse("p:ON:9:" + dest), some_on);
    ASSERT_NE(list.first, nullptr);
    EXPECT_EQ(list.first->dest, dest.substr(0, 4095));
    EXPECT_STREQ(list.first->pattern, "p");
}

TEST_F(EnvironmentSource, CutsALongDestinationWithASize)
{
    const std::string dest = "/" + std::string(5000, 'd');
    EXPECT_EQ(parse("p:ON:9:" + dest + ":5242880"), some_on);
    ASSERT_NE(list.first, nullptr);
    EXPECT_EQ(list.first->dest, dest.substr(0, 4095));
    EXPECT_EQ(list.first->pages, 20U);
}

TEST_F(EnvironmentSource, TakesAThousandSpecifications)
{
    std::string value;
    for (int number = 0; number < 1000; ++number) value += "p" + std::to_string(number) + ":ON:9:/d,";
    EXPECT_EQ(parse(value), some_on);
    EXPECT_EQ(list.all().size(), 1000U);
}

TEST_F(EnvironmentSource, HasATwinForAClusterName)
{
    be_in_cluster("c1", "id1");
    EXPECT_EQ(parse("/var/qn/c1/(.*):ON:9:/d"), some_on);
    EXPECT_EQ(list.patterns(), (std::vector<std::string>{"/var/qn/c1/(.*)", "/var/qn/id1/(.*)"}));
}

TEST_F(EnvironmentSource, KeepsWhatWasReadBeforeMemoryRanOut)
{
    int made = 0;
    calls().calloc = [&](size_t count, size_t size) -> void * {
        if (count * size == sizeof(trace_spool_spec_t) && ++made == 2) return nullptr;
        return __real_calloc(count, size);
    };
    EXPECT_EQ(parse("a:ON:9:/d,b:ON:9:/e,c:ON:9:/f"), faulty);
    calls().calloc = nullptr;
    EXPECT_EQ(last_error().code, 14);
    EXPECT_EQ(list.patterns(), std::vector<std::string>{"a"});
}

TEST_F(EnvironmentSource, SaysNothingAboutAFault)
{
    debug_on();
    leave_marker();
    EXPECT_EQ(parse("p:YES:9:/d"), faulty);
    EXPECT_TRUE(marker_is_there());
    EXPECT_TRUE(system_log().empty());
}
} // namespace
