// The loader's view of this module, however long its name is.
#include <windows.h>

#include "native_modules/quorral_valto/src/valto_wrapper/util.h"
#include "utils/utf8.h"

namespace quorral::util {

std::string ModuleBasePath() {
    HMODULE module = nullptr;
    const auto here = reinterpret_cast<LPCWSTR>(&ModuleBasePath);
    if (GetModuleHandleExW(
            GET_MODULE_HANDLE_EX_FLAG_FROM_ADDRESS | GET_MODULE_HANDLE_EX_FLAG_UNCHANGED_REFCOUNT,
            here, &module) == 0) {
        return {};
    }
    std::wstring path(MAX_PATH, L'\0');
    while (GetModuleFileNameW(module, path.data(), static_cast<DWORD>(path.size())) ==
           path.size()) {
        path.resize(2 * path.size());
    }
    const auto cut = path.find_last_of(L"\\/");
    return cut == std::wstring::npos ? std::string() : MORVA::UTILS::toUtf8(path.substr(0, cut));
}

}  // namespace quorral::util
