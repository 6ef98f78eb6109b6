// The loader's view of this module.
#include <dlfcn.h>

#include "native_modules/quorral_valto/src/valto_wrapper/util.h"

namespace quorral::util {

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
