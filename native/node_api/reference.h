// References that keep, or only watch, a script value beyond the call that brought it.
//
// Thread rule: made on the owner thread; may be destroyed on any thread, the release then happens
// on the loop thread. Destroying one after its environment was torn down does nothing.
#pragma once

#include <node_api.h>

#include <memory>
#include <utility>

#include "native/node_api/environment.h"
#include "native/node_api/value.h"

namespace quorral::node_api {

// Does not keep the value alive; get() is empty once the value was collected.
template <class T>
class WeakReference {
public:
    explicit WeakReference(const T& value) {
        if (value.IsEmpty() || value.environment() == nullptr) return;
        reference_ = value.environment()->CreateReference(value.get());
        if (reference_ != nullptr) environment_ = value.environment()->shared_from_this();
    }
    virtual ~WeakReference() {
        Release([](Environment& owner, napi_ref reference) { owner.DeleteReference(reference); });
    }
    WeakReference(const WeakReference&) = delete;
    WeakReference& operator=(const WeakReference&) = delete;

    bool IsEmpty() const { return reference_ == nullptr; }

    // [owner thread]
    T get() const {
        napi_value value = nullptr;
        if (IsEmpty() || !environment_->Usable() ||
            napi_get_reference_value(environment_->env(), reference_, &value) != napi_ok ||
            value == nullptr) {
            return T();
        }
        return T(value);
    }

protected:
    // Performs a release step on the owner thread. Without memory for the task the step is left
    // out: the environment's teardown deletes whatever is still referenced.
    template <class Step>
    void Release(Step step) noexcept {
        if (IsEmpty()) return;
        try {
            environment_->RunOrPost(
                [owner = environment_, reference = reference_, step] { step(*owner, reference); });
        } catch (...) {
        }
    }

    Environment* environment() const { return environment_.get(); }
    napi_ref reference() const { return reference_; }

private:
    std::shared_ptr<Environment> environment_;
    napi_ref reference_ = nullptr;
};

// Keeps the value alive, and the event loop waiting, until it is destroyed.
template <class T>
class Reference final : public WeakReference<T> {
public:
    explicit Reference(const T& value) : WeakReference<T>(value) {
        if (this->IsEmpty()) return;
        napi_reference_ref(this->environment()->env(), this->reference(), nullptr);
        this->environment()->HoldLoop();
    }
    ~Reference() override {
        this->Release([](Environment& owner, napi_ref reference) {
            owner.ReleaseLoop();
            if (owner.Usable()) napi_reference_unref(owner.env(), reference, nullptr);
        });
    }
};

}  // namespace quorral::node_api
