// Where the result of vad, level and inspect goes, and in which form.
#pragma once

#include <CLI/CLI.hpp>
#include <filesystem>
#include <string>

#include "formatted.h"
#include "streams.h"

namespace morva::cli {

struct TextOutput {
    std::filesystem::path file;  // empty: standard output
    std::string format;          // "text", "csv", "json"; empty: by the file's ending, else text

    std::string chosenFormat() const;
    // Throws Error when it cannot be written.
    void write(Streams& streams, std::string const& text) const;
};

// -o/--output and --format.
void addTextOutput(CLI::App& command, TextOutput& output);

}  // namespace morva::cli
