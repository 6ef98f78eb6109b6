// What a path looks like here: one separator, one root.
#include "utils/path.h"

namespace MORVA::UTILS {

std::wstring const Path::separator_ = L"/";

std::size_t Path::rootLength() const {
    return path_.starts_with(separator_) ? 1 : 0;
}

}  // namespace MORVA::UTILS
