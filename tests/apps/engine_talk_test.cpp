// What the tool makes of the engine's diagnostics, and how it keeps them off its own output.
#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdio>
#include <iostream>

#include "streams.h"

namespace morva::cli {
namespace {

TEST(EngineTalk, ExplainsWithTheMessageOfAnException) {
    EXPECT_EQ(
        explain(
            "WEIGHT a.mvw\nMORVA_Exeption in file src/x Line 7 Function f\n messege No  such \n"),
        "No  such");
}

TEST(EngineTalk, ExplainsWithTheLastLineOtherwise) {
    EXPECT_EQ(explain("WEIGHT a.mvw\nWARNING one \n\n"), "WARNING one");
    EXPECT_EQ(explain("only"), "only");
    EXPECT_EQ(explain(" \n"), "");
}

TEST(EngineTalk, HearsBothStreamsAndGivesThemBack) {
    testing::internal::CaptureStdout();
    {
        Streams streams(false);
        std::cout << "before\n" << std::flush;
        {
            EngineTalk const talk(streams);
            std::printf("from C");  // unflushed: still heard
            std::cerr << "\nfrom C++\n";
            EXPECT_EQ(talk.reason(), "from C++");
        }
        EngineTalk const later(streams);
        EXPECT_EQ(later.reason(), "");  // each section hears only itself
        streams.out("the result\n");
    }
    std::cout << "after\n" << std::flush;
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "the result\nafter\n");
}

TEST(Streams, AFullOutputIsAnError) {
    int const kept = ::dup(STDOUT_FILENO);
    ASSERT_NE(std::freopen("/dev/full", "w", stdout), nullptr);
    {
        Streams streams(false);
        EXPECT_THROW(streams.out("text"), std::exception);
    }
    ::dup2(kept, STDOUT_FILENO);
    ::close(kept);
}

}  // namespace
}  // namespace morva::cli
