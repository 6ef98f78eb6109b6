// The event-loop executor on a real loop: order, wake-ups, destruction with work pending.
#include "native/uv/executor.h"

#include <gtest/gtest.h>

#include <atomic>
#include <functional>
#include <memory>
#include <random>
#include <stdexcept>
#include <thread>
#include <utility>
#include <vector>

namespace quorral::uv {
namespace {

using FunctionTask = Task<std::function<void()>>;

std::unique_ptr<ITask> MakeTask(std::function<void()> work) {
    return std::make_unique<FunctionTask>(std::move(work));
}

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
    // One wake-up: blocks until the async handle has fired.
    void RunOnce() { uv_run(&loop_, UV_RUN_ONCE); }

    uv_loop_t loop_{};
    std::unique_ptr<Executor> executor_;
};

TEST_F(ExecutorTest, RunsTasksOfAThreadInOrderOnTheLoopThread) {
    constexpr int kTasks = 300;
    std::vector<int> order;
    const auto loopThread = std::this_thread::get_id();
    std::jthread producer([&] {
        for (int i = 0; i < kTasks; ++i) {
            executor_->ExecuteInternal(MakeTask([&, i] {
                EXPECT_EQ(std::this_thread::get_id(), loopThread);
                order.push_back(i);
            }));
        }
    });
    while (order.size() < kTasks) RunOnce();
    for (int i = 0; i < kTasks; ++i) EXPECT_EQ(order[static_cast<std::size_t>(i)], i);
}

TEST_F(ExecutorTest, KeepsTheOrderOfEachOfManyProducers) {
    const unsigned seed = std::random_device{}();
    SCOPED_TRACE(testing::Message() << "seed " << seed);
    std::mt19937 random(seed);
    const int producers = 2 + static_cast<int>(random() % 4);
    const int each = 200 + static_cast<int>(random() % 300);
    std::vector<int> next(static_cast<std::size_t>(producers), 0);
    int ran = 0;
    std::vector<std::jthread> threads;
    for (int p = 0; p < producers; ++p) {
        threads.emplace_back([&, p] {
            for (int i = 0; i < each; ++i) {
                executor_->ExecuteInternal(MakeTask([&, p, i] {
                    EXPECT_EQ(next[static_cast<std::size_t>(p)]++, i);
                    ++ran;
                }));
            }
        });
    }
    while (ran < producers * each) RunOnce();
}

TEST_F(ExecutorTest, RunsWhatATaskSubmitsOnALaterWakeUp) {
    std::vector<int> batches;
    int batch = 0;
    executor_->ExecuteInternal(MakeTask([&] {
        batches.push_back(batch);
        executor_->ExecuteInternal(MakeTask([&] { batches.push_back(batch); }));
    }));
    executor_->ExecutePending();
    ++batch;
    executor_->ExecutePending();
    EXPECT_EQ(batches, (std::vector{0, 1}));
    RunOnce();
}

TEST_F(ExecutorTest, DestroysTheTasksOfABatchFromLastToFirst) {
    std::vector<int> destroyed;
    struct Token {
        std::vector<int>& log;
        int id;
        ~Token() { log.push_back(id); }
    };
    for (int i = 0; i < 3; ++i) {
        const std::shared_ptr<Token> token(new Token{destroyed, i});
        executor_->ExecuteInternal(MakeTask([token] {}));
    }
    EXPECT_TRUE(destroyed.empty());
    RunOnce();
    EXPECT_EQ(destroyed, (std::vector{2, 1, 0}));
}

TEST_F(ExecutorTest, DropsPendingTasksUnrunWhenDestroyed) {
    const auto token = std::make_shared<int>(0);
    bool ran = false;
    executor_->ExecuteInternal(MakeTask([&ran, token] { ran = true; }));
    EXPECT_EQ(token.use_count(), 2);
    executor_.reset();
    EXPECT_EQ(token.use_count(), 1);
    // The wake-up that was already sent finds no executor and does nothing.
    uv_run(&loop_, UV_RUN_DEFAULT);
    EXPECT_FALSE(ran);
}

TEST_F(ExecutorTest, ATaskMayDestroyTheExecutorThatRunsIt) {
    bool later = false;
    executor_->ExecuteInternal(MakeTask([&] { executor_.reset(); }));
    executor_->ExecuteInternal(MakeTask([&] { later = true; }));
    RunOnce();
    EXPECT_EQ(executor_, nullptr);
    EXPECT_TRUE(later);  // it was taken out with the batch
}

TEST_F(ExecutorTest, AThrowingTaskDoesNotKeepTheNextFromRunning) {
    bool ran = false;
    executor_->ExecuteInternal(MakeTask([] { throw std::runtime_error("task"); }));
    executor_->ExecuteInternal(MakeTask([&] { ran = true; }));
    RunOnce();
    EXPECT_TRUE(ran);
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
