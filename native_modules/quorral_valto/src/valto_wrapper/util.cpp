// Text conversion through the standard library's converters.
#include "native_modules/quorral_valto/src/valto_wrapper/util.h"

#include <codecvt>
#include <locale>
#include <mutex>

namespace quorral::util {

// The converters are deprecated for want of a better error report than an exception; an exception
// is what is needed here. They keep state, so the shared ones are locked.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wdeprecated-declarations"

std::string ToUTF8(const std::wstring& text) {
    static std::mutex lock;
    static std::wstring_convert<std::codecvt_utf8<wchar_t>> converter;
    const std::lock_guard guard(lock);
    return converter.to_bytes(text);
}

std::wstring ToUTF16(const std::string& text) {
    static std::mutex lock;
    static std::wstring_convert<std::codecvt_utf8_utf16<wchar_t>> converter;
    const std::lock_guard guard(lock);
    return converter.from_bytes(text);
}

#pragma GCC diagnostic pop

}  // namespace quorral::util
