// Event-loop executor: one async handle wakes the loop, one lock guards two lists.
#include "native/uv/executor.h"

#include <stdexcept>
#include <string>

namespace quorral::uv {

template void DeleteHandle<uv_async_s>(uv_handle_t*);

namespace {

void OnWake(uv_async_t* handle) {
    // No data means that the executor is gone and only the close callback is still due.
    if (handle->data != nullptr) static_cast<Executor*>(handle->data)->ExecutePending();
}

void RunQuietly(ITask& task) noexcept {
    try {
        task.Run();
    } catch (...) {
        // The frames above belong to the event loop, which cannot carry an exception.
    }
}

}  // namespace

Executor::Executor(uv_loop_t* loop) {
    auto handle = std::make_unique<uv_async_t>();
    handle->data = this;
    if (const int error = uv_async_init(loop, handle.get(), OnWake); error != 0) {
        throw std::runtime_error(std::string("uv_async_init: ") + uv_strerror(error));
    }
    asyncHandle_ = handle.release();
}

Executor::~Executor() {
    if (asyncHandle_ != nullptr) {
        asyncHandle_->data = nullptr;
        uv_close(reinterpret_cast<uv_handle_t*>(asyncHandle_), DeleteHandle<uv_async_s>);
        asyncHandle_ = nullptr;
    }
    sharedOwners_.clear();
    // Dropped outside of any lock: a task's destructor may come back to submit another one.
    std::vector<std::unique_ptr<ITask>> dropped;
    {
        const std::lock_guard guard(lock_);
        dropped.swap(pending_);
    }
}

void Executor::ExecuteInternal(std::unique_ptr<ITask> task) {
    {
        const std::lock_guard guard(lock_);
        pending_.push_back(std::move(task));
    }
    if (asyncHandle_ != nullptr) uv_async_send(asyncHandle_);
}

void Executor::ExecutePending() {
    std::vector<std::unique_ptr<ITask>> batch;
    {
        const std::lock_guard guard(lock_);
        batch.swap(pending_);
        std::erase_if(sharedOwners_, [](const auto& owner) { return owner == nullptr; });
    }
    // From here on no member is touched: a task may end the environment that owns this executor.
    for (const auto& task : batch) RunQuietly(*task);
    while (!batch.empty()) batch.pop_back();
}

void Executor::SetKeepsLoopAlive(bool keeps) {
    if (asyncHandle_ == nullptr) return;
    auto* handle = reinterpret_cast<uv_handle_t*>(asyncHandle_);
    if (keeps) {
        uv_ref(handle);
    } else {
        uv_unref(handle);
    }
}

}  // namespace quorral::uv
