// From a script call to a native function of a known shape. Script always gets undefined; results
// travel through callbacks or thrown errors.
#pragma once

#include <node_api.h>

#include <exception>
#include <functional>
#include <memory>
#include <utility>

#include "native/node_api/arguments.h"
#include "native/node_api/environment.h"
#include "native/node_api/value.h"

namespace quorral::node_api {

// Passes one converted argument on to the stored function.
template <class F, class T>
struct CallbackTrampoline {
    static void Invoke(const F& function, const Arguments<T>& arguments) {
        function(arguments.template Get<0>());
    }
};

template <class F>
struct InvokeTrampoline;

template <>
struct InvokeTrampoline<std::function<void()>> {
    static void Invoke(napi_callback_info info) {
        const Arguments<> arguments(info);
        if (!arguments.IsValid()) return;
        (*static_cast<const std::function<void()>*>(arguments.data()))();
    }
};

template <class T>
struct InvokeTrampoline<std::function<void(T)>> {
    using F = std::function<void(T)>;
    static void Invoke(napi_callback_info info) {
        const Arguments<T> arguments(info);
        if (!arguments.IsValid()) return;
        CallbackTrampoline<F, T>::Invoke(*static_cast<const F*>(arguments.data()), arguments);
    }
};

// The native callback behind every function made by BindFunction: no C++ exception leaves it.
template <class F>
napi_value CallFromScript(napi_env env, napi_callback_info info) {
    const Environment::Scope scope(Environment::Of(env));
    try {
        InvokeTrampoline<F>::Invoke(info);
    } catch (const std::exception& failure) {
        Environment::Throw(failure.what());
    }
    return Value::Undefined().get();
}

// [owner thread] Puts a native function on a script object under a name. The function is kept until
// the environment is torn down.
template <class... Ts>
void BindFunction(const Object& target, const char* name, void (*function)(Ts...)) {
    using F = std::function<void(Ts...)>;
    Environment* const current = Environment::Current();
    if (current == nullptr || !current->Usable()) return;
    void* const data = current->Own(std::make_shared<F>(function));
    target.Set(name, Function::Make(CallFromScript<F>, data));
}

}  // namespace quorral::node_api
