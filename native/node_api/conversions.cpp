// Conversions between script values and native values, both ways.
#include <cstdint>

#include "native/node_api/native_value.h"
#include "native/node_api/value_factory.h"

namespace quorral::node_api {

Optional<std::string> NativeValue<std::string>::Get(const Value& value) {
    if (value.IsEmpty() || !value.environment()->Usable() || value.Type() != napi_string) return {};
    const napi_env env = value.environment()->env();
    std::size_t length = 0;
    if (napi_get_value_string_utf8(env, value.get(), nullptr, 0, &length) != napi_ok) return {};
    std::string text(length + 1, '\0');
    if (napi_get_value_string_utf8(env, value.get(), text.data(), text.size(), &length) !=
        napi_ok) {
        return {};
    }
    text.resize(length);
    return text;
}

Value ValueFactory<std::string>::Make(const std::string& text) {
    Environment* const current = Environment::Current();
    napi_value value = nullptr;
    if (current == nullptr || !current->Usable() ||
        napi_create_string_utf8(current->env(), text.data(), text.size(), &value) != napi_ok) {
        return {};
    }
    return Value(value);
}

Value ValueFactory<std::vector<std::string>>::Make(const std::vector<std::string>& texts) {
    const Array array = Array::Make(texts.size());
    std::uint32_t index = 0;
    for (const auto& text : texts) {
        array.Set(index++, ValueFactory<std::string>::Make(text));
    }
    return array;
}

}  // namespace quorral::node_api
