// The event-loop executor on a real loop: wake-ups, destruction with work pending. Threads and
// order are tested from script.
#include "native/uv/executor.h"

#include <gtest/gtest.h>

#include <functional>
#include <memory>
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
    void RunOnce() { uv_run(&loop_, UV_RUN_ONCE); }  // blocks until the async handle has fired

    uv_loop_t loop_{};
    std::unique_ptr<Executor> executor_;
};

TEST_F(ExecutorTest, RunsWhatATaskSubmitsOnALaterWakeUp) {
    std::vector<int> batches;
    int batch = 0;
    Submit([&] {
        batches.push_back(batch);
        Submit([&] { batches.push_back(batch); });
    });
    executor_->ExecutePending();
    ++batch;
    executor_->ExecutePending();
    EXPECT_EQ(batches, (std::vector{0, 1}));
    RunOnce();
}

TEST_F(ExecutorTest, DestroysTheTasksOfABatchFromLastToFirst) {
    std::vector<int> destroyed;
    for (int i = 0; i < 3; ++i) {
        const std::shared_ptr<void> token(nullptr, [&, i](void*) { destroyed.push_back(i); });
        Submit([token] {});
    }
    EXPECT_TRUE(destroyed.empty());
    RunOnce();
    EXPECT_EQ(destroyed, (std::vector{2, 1, 0}));
}

TEST_F(ExecutorTest, DropsPendingTasksUnrunWhenDestroyed) {
    const auto token = std::make_shared<int>(0);
    bool ran = false;
    Submit([&ran, token] { ran = true; });
    EXPECT_EQ(token.use_count(), 2);
    executor_.reset();
    EXPECT_EQ(token.use_count(), 1);
    // The wake-up that was already sent finds no executor and does nothing.
    uv_run(&loop_, UV_RUN_DEFAULT);
    EXPECT_FALSE(ran);
}

TEST_F(ExecutorTest, ATaskMayThrowAndMayDestroyTheExecutorThatRunsIt) {
    bool later = false;
    Submit(nullptr);  // running an empty function throws
    Submit([&] { executor_.reset(); });
    Submit([&] { later = true; });
    RunOnce();
    EXPECT_EQ(executor_, nullptr);
    EXPECT_TRUE(later);  // it was taken out with the batch
}

}  // namespace
}  // namespace quorral::uv
