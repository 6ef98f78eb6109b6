// The event-loop executor on a real loop. Threads and order are tested from script.
#include "native/uv/executor.h"

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <stdexcept>
#include <utility>
#include <vector>

namespace quorral::uv {
namespace {

TEST(ExecutorTest, ABatchRunsWholeAndIsDestroyedFromLastToFirst) {
    uv_loop_t loop{};
    ASSERT_EQ(uv_loop_init(&loop), 0);
    auto executor = std::make_unique<Executor>(&loop);
    const auto submit = [&](std::function<void()> work) {
        executor->ExecuteInternal(std::make_unique<Task<std::function<void()>>>(std::move(work)));
    };
    std::vector<int> ran;
    std::vector<int> destroyed;
    for (int i = 0; i < 4; ++i) {
        const std::shared_ptr<void> token(nullptr, [&, i](void*) { destroyed.push_back(i); });
        submit([&, i, token] {
            ran.push_back(i);
            if (i == 0) submit([&, token] { ran.push_back(4); });
            if (i == 1) throw std::runtime_error("of no concern to the others");
            if (i == 2) executor.reset();  // drops what the first has submitted
        });
    }
    uv_run(&loop, UV_RUN_DEFAULT);
    EXPECT_EQ(ran, (std::vector{0, 1, 2, 3}));
    EXPECT_EQ(destroyed, (std::vector{3, 2, 1, 0}));
    // A handle that was not closed, or whose close callback did not run, keeps the loop busy.
    EXPECT_EQ(uv_loop_close(&loop), 0);
}

}  // namespace
}  // namespace quorral::uv
