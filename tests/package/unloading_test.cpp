// The library loaded and closed by a program that does not link it.
#include <cstdlib>

#include <dlfcn.h>

#include <gtest/gtest.h>
#include <qn_tr.h>

#include "faults/campaign.h"
#include "support/scratch.h"
#include "support/trace_image.h"

namespace
{
using namespace qn::test;

// One call of the library, looked up by its name.
template <class Function>
Function *call(void *library, const char *name)
{
    auto *function = reinterpret_cast<Function *>(dlsym(library, name));
    EXPECT_NE(function, nullptr) << dlerror();
    return function;
}

TEST(Library, MayBeClosedWhileItsThreadRunsAndLoadedAgain)
{
    const scratch folder;
    const std::string trace = folder / "t";
    const tr_category_description_t category = {0, "c0", 1, 1};
    tr_detail_level_t level = 0;
    ASSERT_EQ(setenv("QN_TR_SPOOL", ("t$:ON:8:" + folder / "spool").c_str(), 1), 0);

    const qn_uint32_t times = rounds(20, 1000);
    for (qn_uint32_t round = 0; round < times; ++round) {
        void *library = dlopen(QN_TR_LIBRARY, RTLD_NOW);
        ASSERT_NE(library, nullptr) << dlerror();
        if (round == 0) {
            EXPECT_EQ(call<decltype(tr_set_filename_1)>(library, "tr_set_filename_1")(trace.c_str()), 0);
            EXPECT_EQ(call<decltype(tr_register_component_1)>(library, "tr_register_component_1")("ABCD", &level,
                                                                                                  &category, 1),
                      0);
        }
        EXPECT_EQ(call<decltype(tr_record_id_1)>(library, "tr_record_id_1")("ABCD", round), 0);
        EXPECT_EQ(dlclose(library), 0);
    }
    EXPECT_EQ(level, 1) << "the component is still registered";
    EXPECT_EQ(trace_image::of_file(trace + ".1.sp").records_of(1).size(), times);
    count("Exit paths", "executions", times);
}
} // namespace
