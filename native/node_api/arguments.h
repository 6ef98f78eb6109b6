// Counts, checks and converts the arguments of a script call for a native function.
#pragma once

#include <array>
#include <cstddef>
#include <tuple>
#include <utility>

#include "native/node_api/callback.h"
#include "native/node_api/environment.h"
#include "native/node_api/optional.h"
#include "native/node_api/value.h"

namespace quorral::node_api {

// How a script value becomes a parameter; nothing means "type mismatch".
template <class T>
struct ArgumentOf;

template <>
struct ArgumentOf<Value> {
    static Optional<Value> From(napi_value value) { return Value(value); }
};

template <>
struct ArgumentOf<Callback> {
    static Optional<Callback> From(napi_value value) {
        Callback callback{Function(value)};
        if (callback.IsEmpty()) return {};
        return callback;
    }
};

// [owner thread] Invalid arguments have thrown into script when the constructor returns.
template <class... Ts>
class Arguments {
public:
    static constexpr std::size_t kCount = sizeof...(Ts);

    explicit Arguments(napi_callback_info info) {
        valid_ = Fetch(info) && ConvertAll(std::index_sequence_for<Ts...>());
    }

    bool IsValid() const { return valid_; }
    // What the function was created with.
    void* data() const { return data_; }
    template <std::size_t I>
    const auto& Get() const {
        return *std::get<I>(converted_);
    }

private:
    bool Fetch(napi_callback_info info) {
        const Environment* const current = Environment::Current();
        if (current == nullptr || !current->Usable()) return false;
        std::size_t count = 0;
        if (napi_get_cb_info(current->env(), info, &count, nullptr, nullptr, nullptr) != napi_ok) {
            Environment::ThrowLastError();
            return false;
        }
        if (count > kCount) {
            Environment::Throw("Invalid argument count: expected ", kCount, "; received ", count);
            return false;
        }
        received_ = count;
        napi_value self = nullptr;
        if (napi_get_cb_info(current->env(), info, &count, raw_.data(), &self, &data_) != napi_ok) {
            Environment::ThrowLastError();
            return false;
        }
        return true;
    }

    template <std::size_t... Is>
    bool ConvertAll(std::index_sequence<Is...>) {
        return (Convert<Is>() && ...);
    }

    template <std::size_t I>
    bool Convert() {
        using T = std::tuple_element_t<I, std::tuple<Ts...>>;
        if (I >= received_) {
            Environment::Throw("Invalid argument count: expected ", kCount, "; received ", I);
            return false;
        }
        std::get<I>(converted_) = ArgumentOf<T>::From(raw_[I]);
        if (!std::get<I>(converted_)) {
            Environment::Throw("Invalid argument at index ", I, ": type mismatch");
            return false;
        }
        return true;
    }

    std::array<napi_value, kCount == 0 ? 1 : kCount> raw_{};
    std::tuple<Optional<Ts>...> converted_;
    std::size_t received_ = 0;
    void* data_ = nullptr;
    bool valid_ = false;
};

}  // namespace quorral::node_api
