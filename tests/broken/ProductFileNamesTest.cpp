#include "product/ProductFileNames.hpp"

#include <gtest/gtest.h>

namespace {

TEST(ProductFileNames, names_that_climb_out_or_start_at_the_root_are_refused) {
    const struct {
        const char *name;
        bool inside;
    } cases[] = {
        {"imagery_HH.tif", true},
        {"sub/imagery_HH.tif", true},
        {"image HH.tif", true},
        {"imagé_ß σ.tif", true},
        {"..imagery.tif", true},
        {"imagery..tif", true},
        {"./imagery_HH.tif", true},
        {"...", true},
        {"", true},
        {nullptr, true},
        {"..", false},
        {"../imagery_HH.tif", false},
        {"sub/../imagery_HH.tif", false},
        {"sub/..", false},
        {"sub//../x", false},
        {"/imagery_HH.tif", false},
        {"/", false},
        {"//server/share/x.tif", false},
    };
    for (const auto &c : cases)
        EXPECT_EQ(IsNameInsideProduct(c.name), c.inside)
            << (c.name != nullptr ? c.name : "(null)");
}

} // namespace
