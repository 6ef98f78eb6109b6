// Typed views of script values. A view lives no longer than the native call or task that made it.
//
// Thread rule: each view remembers the environment that was current when it was made; on any other
// thread, or for a value of another type, it is empty and every operation on it is skipped.
#pragma once

#include <node_api.h>

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>

#include "native/node_api/environment.h"

namespace quorral::node_api {

// Any script value.
class Value {
public:
    Value() = default;
    explicit Value(napi_value value);

    bool IsEmpty() const { return value_ == nullptr; }
    napi_value get() const { return value_; }
    Environment* environment() const { return environment_; }
    // The value's type; an empty view has the type of undefined.
    napi_valuetype Type() const;

    static Value Undefined();

protected:
    bool Usable() const { return environment_ != nullptr && environment_->Usable(); }
    napi_env env() const { return environment_->env(); }
    void Clear() { value_ = nullptr; }

private:
    Environment* environment_ = nullptr;
    napi_value value_ = nullptr;
};

// A value whose type is object.
class Object : public Value {
public:
    Object() = default;
    explicit Object(napi_value value);

    // Does nothing for an empty object or an empty value.
    void Set(const char* name, const Value& value) const;
};

// A value whose type is function.
class Function : public Value {
public:
    Function() = default;
    explicit Function(napi_value value);

    // A new nameless function; the runtime hands `data` back to the native callback.
    static Function Make(napi_callback callback, void* data);
    // Script's undefined in the clothes of a function: what an empty callback refers to.
    static Function MakeUndefined();

    // Calls with the global object as `this`, as a callback of its own: microtasks run afterwards.
    // Undefined when the call fails; the exception then stays pending.
    Value Call(std::size_t argc, const napi_value* argv) const;

private:
    struct Unchecked {};
    Function(napi_value value, Unchecked) : Value(value) {}
};

// An object that is an array; knows its length from when the view was made.
class Array : public Value {
public:
    Array() = default;
    explicit Array(napi_value value);

    static Array Make(std::size_t length);

    std::uint32_t Length() const { return length_; }
    void Set(std::uint32_t index, const Value& value) const;

private:
    std::uint32_t length_ = 0;
};

// Opens a handle scope for code that the event loop, not script, has called.
class HandleScope {
public:
    explicit HandleScope(const Environment& environment);
    ~HandleScope();
    HandleScope(const HandleScope&) = delete;
    HandleScope& operator=(const HandleScope&) = delete;

    explicit operator bool() const { return scope_ != nullptr; }

private:
    napi_env env_;
    napi_handle_scope scope_ = nullptr;
};

}  // namespace quorral::node_api
