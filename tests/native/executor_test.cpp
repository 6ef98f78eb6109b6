// The event-loop executor on a real loop: wake-ups, destruction with work pending. Threads and
// order are tested from script.
#include "native/uv/executor.h"

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <stdexcept>
#include <utility>
#include <vector>

namespace quorral::uv {
namespace {

class ExecutorTest : public testing::Test {
protected:
    void SetUp() override {
        ASSERT_EQ(uv_loop_init(&loop_), 0);
        executor_ = std::make_unique<Executor>(&loop_);
    }
    // A handle that was not closed, or whose close callback did not run, keeps the loop busy.
    void TearDown() override {
        executor_.reset();
        uv_run(&loop_, UV_RUN_DEFAULT);
        EXPECT_EQ(uv_loop_close(&loop_), 0);
    }
    void Submit(std::function<void()> work) {
        executor_->ExecuteInternal(std::make_unique<Task<std::function<void()>>>(std::move(work)));
    }

    uv_loop_t loop_{};
    std::unique_ptr<Executor> executor_;
};

TEST_F(ExecutorTest, ABatchRunsWholeAndIsDestroyedFromLastToFirst) {
    std::vector<int> ran;
    std::vector<int> destroyed;
    for (int i = 0; i < 3; ++i) {
        const std::shared_ptr<void> token(nullptr, [&, i](void*) { destroyed.push_back(i); });
        Submit([&, i, token] {
            ran.push_back(i);
            if (i == 0) Submit([&] { ran.push_back(3); });
            if (i == 1) throw std::runtime_error("of no concern to the others");
        });
    }
    executor_->ExecutePending();
    EXPECT_EQ(ran, (std::vector{0, 1, 2}));
    EXPECT_EQ(destroyed, (std::vector{2, 1, 0}));
    uv_run(&loop_, UV_RUN_ONCE);  // blocks until the async handle has fired
    EXPECT_EQ(ran, (std::vector{0, 1, 2, 3}));
}

TEST_F(ExecutorTest, DestroyedByATaskItDropsWhatIsPendingUnrun) {
    const auto token = std::make_shared<int>(0);
    bool ran = false;
    bool later = false;
    Submit([&, token] {
        Submit([&, token] { ran = true; });
        EXPECT_EQ(token.use_count(), 3);
        executor_.reset();
        EXPECT_EQ(token.use_count(), 2);
    });
    Submit([&] { later = true; });
    uv_run(&loop_, UV_RUN_DEFAULT);
    EXPECT_EQ(token.use_count(), 1);
    EXPECT_TRUE(later);  // it was taken out with the batch
    EXPECT_FALSE(ran);
}

}  // namespace
}  // namespace quorral::uv
