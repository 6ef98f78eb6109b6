// Text conversion through the standard library's converters, and the loader's view of this module.
#include "native_modules/quorral_valto/src/valto_wrapper/util.h"

#include <dlfcn.h>

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

std::string ModuleBasePath() {
    Dl_info info{};
    if (dladdr(reinterpret_cast<const void*>(&ModuleBasePath), &info) == 0 ||
        info.dli_fname == nullptr) {
        return {};
    }
    const std::string path = info.dli_fname;
    const auto slash = path.rfind('/');
    return slash == std::string::npos ? std::string() : path.substr(0, slash);
}

}  // namespace quorral::util
