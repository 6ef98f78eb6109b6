// A script function that native code calls back later, from whatever thread has the answer.
#pragma once

#include <functional>
#include <memory>
#include <utility>

#include "native/node_api/environment.h"
#include "native/node_api/reference.h"
#include "native/node_api/value.h"
#include "native/node_api/value_factory.h"

namespace quorral::node_api {

// Copies share one reference; the script function lives until the last copy is gone, wherever that
// happens. Copying and destroying: [any thread]; everything else: [owner thread].
class Callback {
public:
    Callback() = default;
    explicit Callback(const Function& function) {
        auto reference = std::make_shared<Reference<Function>>(function);
        if (reference->IsEmpty()) return;
        environment_ = function.environment()->shared_from_this();
        reference_ = std::move(reference);
    }

    bool IsEmpty() const { return reference_ == nullptr; }
    const std::shared_ptr<Environment>& environment() const { return environment_; }
    // The script function, or undefined in its place when the callback is empty.
    Function function() const { return IsEmpty() ? Function::MakeUndefined() : reference_->get(); }

private:
    std::shared_ptr<Environment> environment_;
    std::shared_ptr<Reference<Function>> reference_;
};

// [owner thread] Converts the value and calls the function with it, inside a handle scope.
template <class T>
void InvokeNow(const Callback& callback, const T& value) {
    const Function function = callback.function();
    const Value argument = ValueFactory<T>::Make(value);
    if (argument.IsEmpty()) return;
    const napi_value argv[] = {argument.get()};
    function.Call(1, argv);
}

// Binds callback and value into work for the loop thread.
template <class T>
std::function<void()> WrapInvoke(Callback callback, T value) {
    return [callback = std::move(callback), value = std::move(value)] {
        Environment& environment = *callback.environment();
        const Environment::Scope current(&environment);
        {
            const HandleScope scope(environment);
            if (scope) InvokeNow(callback, value);
        }
        const HandleScope scope(environment);
        if (scope) environment.ReportPendingException();
    };
}

// [any thread] Delivers on a later turn of the event loop, even when called on the loop thread.
template <class T>
void InvokeCallback(const Callback& callback, T value) {
    if (callback.IsEmpty()) return;
    callback.environment()->Post(std::make_unique<uv::Task<std::function<void()>>>(
        WrapInvoke<T>(callback, std::move(value))));
}

// [any thread] The callback as a plain function of one value.
template <class T>
std::function<void(T)> WrapCallback(Callback callback) {
    return [callback = std::move(callback)](T value) {
        InvokeCallback<T>(callback, std::move(value));
    };
}

}  // namespace quorral::node_api
