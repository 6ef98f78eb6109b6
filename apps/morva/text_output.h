// Where the result of a command goes, and in which form.
#pragma once

#include <CLI/CLI.hpp>
#include <filesystem>
#include <functional>
#include <nlohmann/json.hpp>
#include <string>

#include "formatted.h"
#include "streams.h"

namespace morva::cli {

// Makers of the forms; only the one that is asked for is called.
struct Forms {
    std::function<std::string()> text;
    std::function<std::string()> csv;
    std::function<nlohmann::ordered_json()> json;
};

struct TextOutput {
    std::filesystem::path file;  // empty or "-": standard output
    std::string format;          // "text", "csv", "json"; empty: by the file's ending, else text

    // Both throw Error when it cannot be written.
    void write(Streams& streams, Forms const& forms) const;
    void write(Streams& streams, std::string const& text) const;
};

// -o/--output and --format.
void addTextOutput(CLI::App& command, TextOutput& output);

}  // namespace morva::cli
