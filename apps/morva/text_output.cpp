#include "text_output.h"

#include <cerrno>
#include <fstream>
#include <system_error>

#include "error.h"

namespace morva::cli {

std::string TextOutput::chosenFormat() const {
    if (!format.empty()) return format;
    auto const ending = file.extension();
    return ending == ".csv" ? "csv" : ending == ".json" ? "json" : "text";
}

void TextOutput::write(Streams& streams, std::string const& text) const {
    if (file.empty()) return streams.out(text);
    std::ofstream stream(file, std::ios::binary);
    stream << text << std::flush;
    if (!stream)
        throw Error(file.string() +
                    ": cannot be written: " + std::generic_category().message(errno));
}

void addTextOutput(CLI::App& command, TextOutput& output) {
    command.add_option("-o,--output", output.file, "File to write instead of standard output");
    command
        .add_option("--format", output.format,
                    "text, csv or json (default: by the output's ending)")
        ->check(CLI::IsMember({"text", "csv", "json"}));
}

}  // namespace morva::cli
