// One record per script environment that loaded the module: its interface handle, its executor and
// everything that has to go when the environment goes.
//
// Thread rule: an environment belongs to the thread that made it (its owner). Functions tagged
// [owner thread] do nothing elsewhere; those tagged [any thread] may also be called after the
// environment was torn down. Long-lived holders keep the record itself alive by shared pointer, so
// a callback dropped late by a foreign thread finds a record that says "gone" instead of freed
// memory.
#pragma once

#include <node_api.h>

#include <atomic>
#include <cstddef>
#include <functional>
#include <memory>
#include <mutex>
#include <thread>
#include <unordered_set>
#include <utility>
#include <vector>

#include "native/node_api/format_string.h"
#include "native/uv/executor.h"

namespace quorral::node_api {

class Environment : public std::enable_shared_from_this<Environment> {
public:
    // [owner thread] Makes the record of this thread's environment current and registers its
    // teardown. Throws std::runtime_error when the runtime refuses what it needs: an event
    // loop, a place for the record, a hook.
    static void Initialize(napi_env env);
    // [owner thread] Cleanup hook: drops pending work, deletes the references still held, frees the
    // record unless a foreign thread still holds on to it.
    static void Teardown(void* record);

    // The environment whose native code runs on this thread, or null.
    static Environment* Current();
    // The environment that a call from script belongs to, or null.
    static Environment* Of(napi_env env);
    // How many records exist in this process: what was torn down and let go is not counted.
    static std::size_t LiveCount();

    // [owner thread] Throws a script Error unless one is already pending: the first one wins.
    template <class... Args>
    static void Throw(const Args&... args) {
        if (const Environment* current = Current())
            current->ThrowText(FormatString(args...).c_str());
    }
    // The same for a finished text; takes no memory of its own.
    static void Throw(const char* text) noexcept {
        if (const Environment* current = Current()) current->ThrowText(text);
    }
    // [owner thread] Throws the runtime's own text for the last failed interface call.
    static void ThrowLastError();

    // Whether interface calls are allowed here and now.
    bool Usable() const { return IsOwnerThread() && env() != nullptr; }
    napi_env env() const { return env_.load(std::memory_order_acquire); }

    // [any thread] Hands a task to the event loop; false (and the task dropped) after teardown.
    bool Post(std::unique_ptr<uv::ITask> task);
    // [any thread] Runs the work here when this is the owner thread, which takes no memory,
    // otherwise posts it. After teardown nothing runs.
    template <class Work>
    void RunOrPost(Work work) {
        if (!IsOwnerThread()) {
            Post(std::make_unique<uv::Task<std::function<void()>>>(std::move(work)));
        } else if (env() != nullptr) {
            work();
        }
    }

    // [owner thread] References are listed so that none outlives the environment.
    napi_ref CreateReference(napi_value value);
    void DeleteReference(napi_ref reference);
    // [owner thread] While one script callback is held, the loop waits for it.
    void HoldLoop();
    void ReleaseLoop();
    // [owner thread] Keeps an object until teardown and returns it.
    void* Own(std::shared_ptr<void> object);

    // [owner thread] An exception that no script frame can catch becomes an uncaught one.
    void ReportPendingException() const;

    // Makes an environment current for a native call or a task, then restores the one before.
    class Scope {
    public:
        explicit Scope(Environment* environment);
        ~Scope();
        Scope(const Scope&) = delete;
        Scope& operator=(const Scope&) = delete;

    private:
        Environment* const previous_;
    };

    explicit Environment(napi_env env);
    ~Environment();
    Environment(const Environment&) = delete;
    Environment& operator=(const Environment&) = delete;

private:
    bool IsOwnerThread() const { return owner_ == std::this_thread::get_id(); }
    void ThrowText(const char* text) const noexcept;

    std::atomic<napi_env> env_;
    std::unique_ptr<uv::Executor> executor_;
    const std::thread::id owner_;

    // Guards executor_ against a submission from a foreign thread during teardown. Recursive, since
    // a task that cannot be queued is destroyed right there and may submit work of its own.
    std::recursive_mutex executorLock_;
    std::unordered_set<napi_ref> references_;
    std::vector<std::shared_ptr<void>> owned_;
    std::size_t loopHolders_ = 0;
    std::shared_ptr<Environment> self_;
};

}  // namespace quorral::node_api
