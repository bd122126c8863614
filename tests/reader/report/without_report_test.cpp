// qntrace report in a build that has none.
#include <gtest/gtest.h>

#include "reader/program.h"

namespace qn::test
{
namespace
{

TEST(WithoutReport, TheCommandSaysSo)
{
    const auto made = run_qntrace({"report", "-o", "page.html", "a.trc"});
    EXPECT_EQ(made.status, 2);
    EXPECT_EQ(made.err, "qntrace: this build has no report: there was no npm when it was configured\n");
}

} // namespace
} // namespace qn::test
