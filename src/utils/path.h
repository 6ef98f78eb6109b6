// A file path as a wide string (code points, on Windows UTF-16): made absolute, normalised, and
// opened under its UTF-8 name. A value; any thread as long as each has its own.
#pragma once

#include <fstream>
#include <ios>
#include <string>

namespace MORVA::UTILS {

class Path {
public:
    // All accepted separators, the main one first: "/" alone, on Windows the backslash and "/".
    static std::wstring const separator_;

    // `path` must not be null.
    explicit Path(wchar_t const* path);

    std::wstring const& str() const { return path_; }

    bool isAbsolute() const { return rootLength() > 0; }

    // Puts `front` before a relative path; an absolute one stays. Always true.
    bool pushFront(std::wstring const& front);

    // Removes ".", ".." and repeated separators from an absolute path; a ".." at the root stays
    // there. A relative path is left alone: false.
    bool normalize();

    void replaceAllSeparatorsWithMainSeparator();

    // What follows the last dot of the last component, case kept; empty when there is none.
    std::wstring getFileExtension() const;

    // UTF-8 conversions. Throw std::range_error on what cannot be converted.
    std::string convertWString2MBString(std::wstring const& wide) const;
    std::wstring convertMBString2WString(std::string const& bytes) const;

    // Opens the stream with `mode` plus input (output); returns whether it is open (a folder is
    // not), else the stream's fail flag is set. Throw like the conversions.
    bool openIfstream(std::ifstream& stream, std::ios_base::openmode mode) const;
    bool openOfstream(std::ofstream& stream, std::ios_base::openmode mode) const;

private:
    // Characters of what no ".." leaves, its separator included; 0: the path is relative.
    std::size_t rootLength() const;

    std::wstring path_;
};

}  // namespace MORVA::UTILS
