// What a path looks like here. The main separator is the one that every form of path knows: where
// the system is asked to take a path literally, "\\?\C:\folder", the other one is an ordinary
// character to it.
#include <algorithm>

#include "utils/path.h"

namespace MORVA::UTILS {

std::wstring const Path::separator_ = L"\\/";

// One of "C:\", "\", "\\server\share\" and "\\?\C:\".
std::size_t Path::rootLength() const {
    auto const isSeparator = [&](std::size_t at) {
        return at < path_.size() && separator_.find(path_[at]) != std::wstring::npos;
    };
    if (path_.size() > 1 && path_[1] == L':' && isSeparator(2)) return 3;
    if (!isSeparator(0)) return 0;
    if (!isSeparator(1)) return 1;
    std::size_t at = 2;
    for (int names = 0; names < 2 && at < path_.size(); ++names) {
        at = std::min(path_.find_first_of(separator_, at), path_.size() - 1) + 1;
    }
    return at;
}

}  // namespace MORVA::UTILS
