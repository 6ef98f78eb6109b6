#include "utils/path.h"

#include <filesystem>
#include <string_view>
#include <system_error>

#include "utils/utf8.h"

namespace MORVA::UTILS {
namespace {

void dropLastComponent(std::wstring& path, wchar_t separator) {
    std::size_t const cut =
        path.size() < 2 ? std::wstring::npos : path.rfind(separator, path.size() - 2);
    path.resize(cut == std::wstring::npos ? 0 : cut + 1);
}

// `rest` is what follows the leading separator; every turn of the loop starts at a component.
std::wstring withoutDots(std::wstring_view rest, wchar_t separator) {
    std::wstring const parent = std::wstring(L"..") + separator;
    std::wstring const here = std::wstring(L".") + separator;
    std::wstring result;
    while (!rest.empty() && rest != L".") {
        if (rest.front() == separator) {
            rest.remove_prefix(1);
        } else if (rest == L"..") {
            dropLastComponent(result, separator);
            break;
        } else if (rest.starts_with(here)) {
            rest.remove_prefix(here.size());
        } else if (rest.starts_with(parent)) {
            dropLastComponent(result, separator);
            rest.remove_prefix(parent.size());
        } else {
            std::size_t const next = rest.find(separator);
            std::size_t const length = next == std::wstring_view::npos ? rest.size() : next + 1;
            result.append(rest.substr(0, length));
            rest.remove_prefix(length);
        }
    }
    return result;
}

template <class Stream>
bool openStream(Stream& stream, std::string const& name, std::ios_base::openmode mode) {
    stream.open(std::filesystem::path(std::u8string(name.begin(), name.end())), mode);
    return stream.is_open();
}

}  // namespace

Path::Path(wchar_t const* path) : path_(path) {}

bool Path::pushFront(std::wstring const& front) {
    if (isAbsolute()) return true;
    bool const joined = front.empty() || separator_.find(front.back()) != std::wstring::npos;
    path_ = joined ? front + path_ : front + separator_.front() + path_;
    return true;
}

bool Path::normalize() {
    replaceAllSeparatorsWithMainSeparator();
    std::size_t const root = rootLength();
    if (root == 0) return false;
    path_.replace(root, path_.npos,
                  withoutDots(std::wstring_view(path_).substr(root), separator_.front()));
    return true;
}

void Path::replaceAllSeparatorsWithMainSeparator() {
    for (wchar_t& c : path_) {
        if (separator_.find(c) != std::wstring::npos) c = separator_.front();
    }
}

std::wstring Path::getFileExtension() const {
    std::size_t const dot = path_.rfind(L'.');
    std::size_t const slash = path_.find_last_of(separator_);
    bool const inLastComponent =
        dot != std::wstring::npos && (slash == std::wstring::npos || dot > slash);
    return inLastComponent ? path_.substr(dot + 1) : std::wstring();
}

std::string Path::convertWString2MBString(std::wstring const& wide) const {
    return toUtf8(wide);
}

std::wstring Path::convertMBString2WString(std::string const& bytes) const {
    return toWide(bytes);
}

bool Path::openIfstream(std::ifstream& stream, std::ios_base::openmode mode) const {
    auto const name = convertWString2MBString(path_);
    // Not every C++ library tells a folder from an empty file when it is read.
    std::error_code unknown;
    if (std::filesystem::is_directory(std::u8string(name.begin(), name.end()), unknown)) {
        stream.setstate(std::ios_base::failbit);
        return false;
    }
    return openStream(stream, name, mode | std::ios_base::in);
}

bool Path::openOfstream(std::ofstream& stream, std::ios_base::openmode mode) const {
    return openStream(stream, convertWString2MBString(path_), mode | std::ios_base::out);
}

}  // namespace MORVA::UTILS
