// The event-loop executor on a real loop: order, wake-ups, destruction with work pending.
#include "native/uv/executor.h"

#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <stdexcept>
#include <thread>
#include <utility>
#include <vector>

namespace quorral::uv {
namespace {

using FunctionTask = Task<std::function<void()>>;

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
        executor_->ExecuteInternal(std::make_unique<FunctionTask>(std::move(work)));
    }
    // One wake-up: blocks until the async handle has fired.
    void RunOnce() { uv_run(&loop_, UV_RUN_ONCE); }

    uv_loop_t loop_{};
    std::unique_ptr<Executor> executor_;
};

TEST_F(ExecutorTest, KeepsTheOrderOfEachOfManyProducersOnTheLoopThread) {
    constexpr int kProducers = 4;
    constexpr int kEach = 300;
    std::vector<int> next(kProducers, 0);
    int ran = 0;
    const auto loopThread = std::this_thread::get_id();
    std::vector<std::jthread> threads;
    for (std::size_t p = 0; p < kProducers; ++p) {
        threads.emplace_back([&, p] {
            for (int i = 0; i < kEach; ++i) {
                Submit([&, p, i] {
                    EXPECT_EQ(std::this_thread::get_id(), loopThread);
                    EXPECT_EQ(next[p]++, i);
                    ++ran;
                });
            }
        });
    }
    while (ran < kProducers * kEach) RunOnce();
}

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
    Submit([] { throw std::runtime_error("task"); });
    Submit([&] { executor_.reset(); });
    Submit([&] { later = true; });
    RunOnce();
    EXPECT_EQ(executor_, nullptr);
    EXPECT_TRUE(later);  // it was taken out with the batch
}

TEST_F(ExecutorTest, HoldsTheLoopOnlyWhileTold) {
    EXPECT_NE(uv_loop_alive(&loop_), 0);
    executor_->SetKeepsLoopAlive(false);
    EXPECT_EQ(uv_loop_alive(&loop_), 0);
    executor_->SetKeepsLoopAlive(true);
    EXPECT_NE(uv_loop_alive(&loop_), 0);
}

TEST(TaskTest, AnEmptyFunctionThrows) {
    FunctionTask task{std::function<void()>()};
    EXPECT_THROW(task.Run(), std::bad_function_call);
}

}  // namespace
}  // namespace quorral::uv
