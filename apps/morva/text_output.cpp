#include "text_output.h"

#include "output_file.h"

namespace morva::cli {

void TextOutput::write(Streams& streams, Forms const& forms) const {
    auto const form = format.empty() ? file.extension().string() : '.' + format;
    if (form == ".csv") return write(streams, forms.csv());
    if (form != ".json") return write(streams, forms.text());
    // Texts from files and file names need not be UTF-8.
    write(streams,
          forms.json().dump(1, ' ', false, nlohmann::json::error_handler_t::replace) + '\n');
}

void TextOutput::write(Streams& streams, std::string const& text) const {
    if (file.empty() || file == standardStream) return streams.out(text);
    OutputFile target(file);
    target.unfinished().write(text);
    target.finish();
}

void addTextOutput(CLI::App& command, TextOutput& output) {
    command.add_option("-o,--output", output.file, "File to write instead of standard output");
    command
        .add_option("--format", output.format,
                    "text, csv or json (default: by the output's ending)")
        ->check(CLI::IsMember({"text", "csv", "json"}));
}

}  // namespace morva::cli
