// Environment record: life from the module's registration to the runtime's cleanup hook.
#include "native/node_api/environment.h"

#include <stdexcept>
#include <string>
#include <utility>

namespace quorral::node_api {
namespace {

thread_local Environment* tCurrent = nullptr;
std::atomic<std::size_t> gLiveEnvironments{0};

}  // namespace

Environment::Environment(napi_env env) : env_(env), owner_(std::this_thread::get_id()) {
    ++gLiveEnvironments;
}

Environment::~Environment() {
    --gLiveEnvironments;
}

void Environment::Initialize(napi_env env) {
    uv_loop_t* loop = nullptr;
    if (napi_get_uv_event_loop(env, &loop) != napi_ok || loop == nullptr) {
        throw std::runtime_error("The runtime offers no event loop");
    }
    auto record = std::make_shared<Environment>(env);
    record->executor_ = std::make_unique<uv::Executor>(loop);
    record->executor_->SetKeepsLoopAlive(false);
    if (napi_set_instance_data(env, record.get(), nullptr, nullptr) != napi_ok) {
        throw std::runtime_error("The runtime keeps no data for this module");
    }
    if (napi_add_env_cleanup_hook(env, Teardown, record.get()) != napi_ok) {
        napi_set_instance_data(env, nullptr, nullptr, nullptr);
        throw std::runtime_error("The runtime takes no cleanup hook");
    }
    // The record holds itself until the cleanup hook runs.
    record->self_ = record;
    tCurrent = record.get();
}

void Environment::Teardown(void* record) {
    const std::shared_ptr<Environment> self = std::move(static_cast<Environment*>(record)->self_);
    {
        const Scope scope(self.get());
        std::unique_ptr<uv::Executor> executor;
        {
            const std::lock_guard guard(self->executorLock_);
            executor = std::move(self->executor_);
        }
        // Callbacks inside pending tasks release their references here, on the owner thread.
        executor.reset();
        for (napi_ref reference : std::exchange(self->references_, {})) {
            napi_delete_reference(self->env(), reference);
        }
        self->owned_.clear();
        self->env_.store(nullptr, std::memory_order_release);
    }
    if (tCurrent == self.get()) tCurrent = nullptr;
}

Environment* Environment::Current() {
    return tCurrent;
}

Environment* Environment::Of(napi_env env) {
    void* record = nullptr;
    return napi_get_instance_data(env, &record) == napi_ok ? static_cast<Environment*>(record)
                                                           : nullptr;
}

std::size_t Environment::LiveCount() {
    return gLiveEnvironments.load();
}

void Environment::ThrowText(const char* text) const noexcept {
    if (!Usable()) return;
    bool pending = false;
    if (napi_is_exception_pending(env(), &pending) != napi_ok || pending) return;
    napi_throw_error(env(), nullptr, text);
}

void Environment::ThrowLastError() {
    const Environment* current = Current();
    if (current == nullptr || !current->Usable()) return;
    const napi_extended_error_info* info = nullptr;
    const bool known = napi_get_last_error_info(current->env(), &info) == napi_ok &&
                       info != nullptr && info->error_message != nullptr;
    current->ThrowText(known ? info->error_message : "Unknown failure");
}

bool Environment::Post(std::unique_ptr<uv::ITask> task) {
    const std::lock_guard guard(executorLock_);
    if (!executor_) return false;
    executor_->ExecuteInternal(std::move(task));
    return true;
}

napi_ref Environment::CreateReference(napi_value value) {
    napi_ref reference = nullptr;
    if (!Usable() || napi_create_reference(env(), value, 0, &reference) != napi_ok) return nullptr;
    try {
        references_.insert(reference);
    } catch (...) {
        napi_delete_reference(env(), reference);
        throw;
    }
    return reference;
}

void Environment::DeleteReference(napi_ref reference) {
    // The list decides: what teardown has deleted is not there any more.
    if (Usable() && references_.erase(reference) != 0) napi_delete_reference(env(), reference);
}

void Environment::HoldLoop() {
    if (++loopHolders_ == 1 && executor_) executor_->SetKeepsLoopAlive(true);
}

void Environment::ReleaseLoop() {
    if (--loopHolders_ == 0 && executor_) executor_->SetKeepsLoopAlive(false);
}

void* Environment::Own(std::shared_ptr<void> object) {
    owned_.push_back(std::move(object));
    return owned_.back().get();
}

void Environment::ReportPendingException() const {
    bool pending = false;
    if (!Usable() || napi_is_exception_pending(env(), &pending) != napi_ok || !pending) return;
    napi_value error = nullptr;
    if (napi_get_and_clear_last_exception(env(), &error) == napi_ok) {
        napi_fatal_exception(env(), error);
    }
}

Environment::Scope::Scope(Environment* environment) : previous_(tCurrent) {
    tCurrent = environment;
}

Environment::Scope::~Scope() {
    tCurrent = previous_;
}

}  // namespace quorral::node_api
