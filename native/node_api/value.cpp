// Typed views of script values over the interface calls that make and read them.
#include "native/node_api/value.h"

namespace quorral::node_api {
namespace {

// Keeps the handles of one callback invocation out of the surrounding scope, but for the result.
class EscapableScope {
public:
    explicit EscapableScope(napi_env env) : env_(env) {
        if (napi_open_escapable_handle_scope(env_, &scope_) != napi_ok) scope_ = nullptr;
    }
    ~EscapableScope() {
        if (scope_ != nullptr) napi_close_escapable_handle_scope(env_, scope_);
    }
    EscapableScope(const EscapableScope&) = delete;
    EscapableScope& operator=(const EscapableScope&) = delete;

    explicit operator bool() const { return scope_ != nullptr; }
    napi_value Escape(napi_value value) const {
        napi_value escaped = nullptr;
        return napi_escape_handle(env_, scope_, value, &escaped) == napi_ok ? escaped : nullptr;
    }

private:
    napi_env env_;
    napi_escapable_handle_scope scope_ = nullptr;
};

class AsyncContext {
public:
    explicit AsyncContext(napi_env env) : env_(env) {
        napi_value name = nullptr;
        if (napi_create_string_utf8(env_, "callback", NAPI_AUTO_LENGTH, &name) != napi_ok ||
            napi_async_init(env_, nullptr, name, &context_) != napi_ok) {
            context_ = nullptr;
        }
    }
    ~AsyncContext() {
        if (context_ != nullptr) napi_async_destroy(env_, context_);
    }
    AsyncContext(const AsyncContext&) = delete;
    AsyncContext& operator=(const AsyncContext&) = delete;

    napi_async_context get() const { return context_; }

private:
    napi_env env_;
    napi_async_context context_ = nullptr;
};

}  // namespace

Value::Value(napi_value value) {
    Environment* const current = Environment::Current();
    if (current == nullptr || !current->Usable()) return;
    environment_ = current;
    value_ = value;
}

napi_valuetype Value::Type() const {
    napi_valuetype type = napi_undefined;
    if (value_ != nullptr && Usable()) napi_typeof(env(), value_, &type);
    return type;
}

Value Value::Undefined() {
    Environment* const current = Environment::Current();
    napi_value undefined = nullptr;
    if (current != nullptr && current->Usable()) napi_get_undefined(current->env(), &undefined);
    return Value(undefined);
}

Object::Object(napi_value value) : Value(value) {
    if (Type() != napi_object) Clear();
}

void Object::Set(const char* name, const Value& value) const {
    if (IsEmpty() || value.IsEmpty() || !Usable()) return;
    napi_set_named_property(env(), get(), name, value.get());
}

Function::Function(napi_value value) : Value(value) {
    if (Type() != napi_function) Clear();
}

Function Function::Make(napi_callback callback, void* data) {
    Environment* const current = Environment::Current();
    napi_value function = nullptr;
    if (current == nullptr || !current->Usable() ||
        napi_create_function(current->env(), nullptr, 0, callback, data, &function) != napi_ok) {
        return {};
    }
    return Function(function);
}

Function Function::MakeUndefined() {
    return Function(Value::Undefined().get(), Unchecked{});
}

Value Function::Call(std::size_t argc, const napi_value* argv) const {
    if (IsEmpty() || !Usable()) return {};
    const EscapableScope scope(env());
    if (!scope) return Undefined();
    napi_value global = nullptr;
    napi_value result = nullptr;
    const AsyncContext context(env());
    if (context.get() == nullptr || napi_get_global(env(), &global) != napi_ok ||
        napi_make_callback(env(), context.get(), global, get(), argc, argv, &result) != napi_ok) {
        result = Undefined().get();
    }
    return result == nullptr ? Value() : Value(scope.Escape(result));
}

Array::Array(napi_value value) : Value(value) {
    bool isArray = false;
    if (IsEmpty() || napi_is_array(env(), value, &isArray) != napi_ok || !isArray ||
        napi_get_array_length(env(), value, &length_) != napi_ok) {
        Clear();
        length_ = 0;
    }
}

Array Array::Make(std::size_t length) {
    Environment* const current = Environment::Current();
    napi_value array = nullptr;
    if (current == nullptr || !current->Usable() ||
        napi_create_array_with_length(current->env(), length, &array) != napi_ok) {
        return {};
    }
    return Array(array);
}

void Array::Set(std::uint32_t index, const Value& value) const {
    if (IsEmpty() || value.IsEmpty() || !Usable()) return;
    napi_set_element(env(), get(), index, value.get());
}

HandleScope::HandleScope(const Environment& environment) : env_(environment.env()) {
    if (!environment.Usable() || napi_open_handle_scope(env_, &scope_) != napi_ok) {
        scope_ = nullptr;
        Environment::Throw("Failed to open handle scope");
    }
}

HandleScope::~HandleScope() {
    if (scope_ != nullptr && napi_close_handle_scope(env_, scope_) != napi_ok) {
        Environment::Throw("Failed to close handle scope");
    }
}

}  // namespace quorral::node_api
