// Any code points as a path: normalising against a plain reference, extension and conversion
// promises.
#include <algorithm>
#include <cstring>
#include <stdexcept>
#include <vector>

#include "harness.h"
#include "utils/path.h"

namespace {

using MORVA::UTILS::Path;

// Component by component: what remains, each with its trailing separator, the last one only if it
// had one.
std::wstring reference(std::wstring const& path) {
    std::vector<std::wstring> kept;
    for (std::size_t at = 1; at <= path.size();) {
        auto const end = std::min(path.find(L'/', at), path.size());
        auto const component = path.substr(at, end - at);
        if (component == L"..") {
            if (!kept.empty()) kept.pop_back();
        } else if (!component.empty() && component != L".") {
            kept.push_back(path.substr(at, end - at + 1));
        }
        at = end + 1;
    }
    std::wstring joined = L"/";
    for (auto const& component : kept) joined += component;
    return joined;
}

void check(std::wstring const& text) {
    Path path(text.c_str());
    bool const absolute = text.starts_with(L'/');
    fuzz::require(path.normalize() == absolute, "only absolute paths are normalised");
    fuzz::require(path.str() == (absolute ? reference(text) : text), "normalised as the reference");
    auto const extension = Path(text.c_str()).getFileExtension();
    fuzz::require(extension.find_first_of(L"/.") == std::wstring::npos && text.ends_with(extension),
                  "an extension is one word that ends the path");
    path.pushFront(L"/base");
    fuzz::require(path.isAbsolute(), "a path behind an absolute one is absolute");
    // Legal code points come back; anything else is a range_error.
    bool const legal = std::ranges::all_of(text, [](wchar_t c) {
        auto const point = static_cast<std::uint32_t>(c);
        return point <= 0x10ffffU && (point < 0xd800U || point > 0xdfffU);
    });
    try {
        auto const bytes = path.convertWString2MBString(text);
        fuzz::require(path.convertMBString2WString(bytes) == text || !legal, "UTF-8 comes back");
    } catch (std::range_error const&) {
        fuzz::require(!legal, "legal code points convert");
    }
}

void checkBytes(std::string const& bytes) {
    try {
        Path(L"").convertMBString2WString(bytes);
    } catch (std::range_error const&) {
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size) {
    if (size == 0) return 0;
    checkBytes({reinterpret_cast<char const*>(data + 1), size - 1});
    // The first byte chooses between code points and plain letters, which hit separators more
    // often.
    std::wstring text;
    bool const wide = data[0] % 2 == 0;
    std::size_t const step = wide ? sizeof(wchar_t) : 1;
    for (std::size_t at = 1; at + step <= size; at += step) {
        wchar_t c = static_cast<wchar_t>(L"/./.ab\x20ac"[data[at] % 7]);
        if (wide) std::memcpy(&c, data + at, sizeof(c));
        if (c != 0) text.push_back(c);
    }
    check(text);
    return 0;
}
