// Control files: text that names a model's weight file and sets its parameters.
//
// One entry per line: a key, whitespace, and the rest of the line as value, without the whitespace
// around it. Skipped: empty lines, lines of whitespace, and lines whose very first byte is '#'.
// Whitespace is blank, tab, newline, vertical tab, form feed and carriage return; every other byte,
// NUL included, is text.
#pragma once

#include <string>
#include <utility>
#include <vector>

#include "utils/path.h"

namespace MORVA::UTILS {

// Appends the file's entries in order, duplicates included. False when the file cannot be opened or
// read, or at the first line that lacks a key or a value (the entries before it have been
// appended).
bool readControlFile(std::vector<std::pair<std::string, std::string>>& out, Path const& path);

// Splits one line; the key, the value or both may come out empty.
std::pair<std::string, std::string> getKeyValue(std::string const& line);

}  // namespace MORVA::UTILS
