// morva level: the level of the background noise in a file, one value per frame.
#include <algorithm>
#include <string>
#include <vector>

#include "command.h"
#include "frame_values.h"
#include "text_output.h"

namespace morva::cli {
namespace {

struct LevelOptions {
    EngineOptions engine;
    TextOutput output;
    std::filesystem::path file;
};

std::string asText(std::vector<float> levels, double frameMs) {
    if (levels.empty()) return "no frames\n";
    auto const count = levels.size();
    std::ranges::sort(levels);
    auto const line = [](char const* name, float level) {
        return formatted("%-8s %8.2f dB %8.2f dBFS\n", name, static_cast<double>(level),
                         static_cast<double>(level) - fullScaleDb);
    };
    return line("lowest", levels.front()) + line("median", levels[count / 2]) +
           line("highest", levels.back()) + formatted("%zu frames of %g ms\n", count, frameMs);
}

std::string asCsv(std::vector<float> const& levels, double frameMs) {
    std::string text = "time_s,level_db,level_dbfs\n";
    for (std::size_t i = 0; i < levels.size(); ++i) {
        double const level = static_cast<double>(levels[i]);
        text += formatted("%.3f,%.4f,%.4f\n", static_cast<double>(i) * frameMs / 1000.0, level,
                          level - fullScaleDb);
    }
    return text;
}

int run(LevelOptions const& options) {
    options.engine.inputs(options.file).mustNotHold(options.output.file);
    Workbench bench(options.engine);
    auto const sound = readMono(options.file);
    auto const levels = noiseLevels(bench, bench.model, sound);
    double const frameMs = bench.frameMs;
    auto const asJson = [&] {
        return nlohmann::ordered_json{{"file", sound.name},
                                      {"sample_rate", sound.rateHz},
                                      {"frame_ms", frameMs},
                                      {"full_scale_db", fullScaleDb},
                                      {"levels_db", levels}};
    };
    options.output.write(bench.streams, {[&] { return asText(levels, frameMs); },
                                         [&] { return asCsv(levels, frameMs); }, asJson});
    return ended(bench.streams, sound);
}

}  // namespace

void addLevel(CLI::App& app, Action& action) {
    auto& command = *app.add_subcommand("level", "Measure the background noise level per frame");
    auto& options = addOptions(command, action, &run);
    command.add_option("file", options.file, "Sound file; channels are averaged")->required();
    addTextOutput(command, options.output);
    addEngineOptions(command, options.engine);
}

}  // namespace morva::cli
