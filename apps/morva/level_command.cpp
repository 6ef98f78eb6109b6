// morva level: the level of the background noise in a file, one value per frame.
#include <algorithm>
#include <nlohmann/json.hpp>
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
    Streams streams(options.engine.verbose);
    Engine engine(streams, controlFolder(options.engine.models));
    Models models(engine, options.engine.models);
    auto const sound = readMono(options.file);
    auto const levels =
        noiseLevels(engine, models, options.file.string(), sound, options.engine.frameMs);
    auto const format = options.output.chosenFormat();
    double const frameMs = options.engine.frameMs;
    if (format == "json") {
        nlohmann::ordered_json const page{{"file", options.file.string()},
                                          {"sample_rate", sound.rateHz},
                                          {"frame_ms", frameMs},
                                          {"full_scale_db", fullScaleDb},
                                          {"levels_db", levels}};
        options.output.write(streams, page.dump(1) + '\n');
    } else {
        options.output.write(streams,
                             format == "csv" ? asCsv(levels, frameMs) : asText(levels, frameMs));
    }
    return 0;
}

}  // namespace

void addLevel(CLI::App& app, Action& action) {
    auto const options = std::make_shared<LevelOptions>();
    auto* command = app.add_subcommand("level", "Measure the background noise level per frame");
    command->add_option("file", options->file, "Sound file; channels are averaged")->required();
    addTextOutput(*command, options->output);
    addEngineOptions(*command, options->engine);
    command->callback([options, &action] { action = [options] { return run(*options); }; });
}

}  // namespace morva::cli
