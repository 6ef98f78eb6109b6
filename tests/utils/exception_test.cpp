#include "utils/exception.h"

#include <gtest/gtest.h>

using MORVA::UTILS::MORVA_Exception;

TEST(Exception, ComposesItsText) {
    MORVA_Exception const error("it broke", "src/unit", 7, "work");
    EXPECT_STREQ(error.what(),
                 "MORVA_Exeption in file src/unit Line 7 Function work\n messege it broke");
    EXPECT_EQ(error.file(), "src/unit");
    EXPECT_EQ(error.function(), "work");
    EXPECT_EQ(error.line(), 7);
}

TEST(Exception, RaiseCarriesTheCallersLine) {
    int const line = __LINE__ + 2;
    try {
        MORVA::UTILS::raise("x", "src/unit", "work");
    } catch (MORVA_Exception const& error) {
        EXPECT_EQ(error.line(), line);
        EXPECT_EQ(error.file(), "src/unit");
        return;
    }
    FAIL() << "nothing was thrown";
}
