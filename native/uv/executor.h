// Runs work on the thread of a libuv event loop, handed in from any thread.
//
// Thread rule: ExecuteInternal may be called on any thread; everything else only on the loop's own
// thread. A caller that submits from other threads must make sure that the executor outlives the
// call (the binding layer's environment record does this with a lock of its own).
// Units: none. This layer knows nothing of script values.
#pragma once

#include <uv.h>

#include <memory>
#include <mutex>
#include <utility>
#include <vector>

namespace quorral::uv {

// One piece of work, owned by the executor from submission until it has run or been dropped.
class ITask {
public:
    virtual ~ITask() = default;
    virtual void Run() = 0;
};

// A task made of one callable. Running an empty std::function throws std::bad_function_call.
template <class F>
class Task final : public ITask {
public:
    explicit Task(F callable) : callable_(std::move(callable)) {}
    void Run() override { callable_(); }

private:
    F callable_;
};

// Close callback for handles that the executor allocated: gives their memory back.
template <class T>
void DeleteHandle(uv_handle_t* handle) {
    const std::unique_ptr<T> owned(reinterpret_cast<T*>(handle));
}
extern template void DeleteHandle<uv_async_s>(uv_handle_t*);

class Executor {
public:
    // Throws std::runtime_error when the loop refuses another handle.
    explicit Executor(uv_loop_t* loop);
    // Drops what is pending without running it. The handle's memory goes when the loop closes it.
    ~Executor();
    Executor(const Executor&) = delete;
    Executor& operator=(const Executor&) = delete;

    // [any thread] Queues a task and wakes the loop. Tasks run in the order they were handed in.
    void ExecuteInternal(std::unique_ptr<ITask> task);

    // [loop thread] Runs everything queued up to now; what a task submits runs on a later wake-up.
    // A task that throws does not keep the others from running; the exception has no taker above
    // an event loop written in C and is dropped.
    void ExecutePending();

    // [loop thread] Whether an idle executor keeps the loop from ending. It does at first, as every
    // libuv handle.
    void SetKeepsLoopAlive(bool keeps);

private:
    uv_async_t* asyncHandle_ = nullptr;
    std::mutex lock_;
    std::vector<std::unique_ptr<ITask>> pending_;
    std::vector<std::shared_ptr<void>> sharedOwners_;
};

}  // namespace quorral::uv
