// morva vad: the voice score of each frame and the stretches of speech in a file.
#include <string>
#include <vector>

#include "command.h"
#include "frame_values.h"
#include "segments.h"
#include "text_output.h"

namespace morva::cli {
namespace {

struct VadOptions {
    EngineOptions engine;
    TextOutput output;
    std::filesystem::path file;
    SegmentRules rules;
};

struct Findings {
    std::vector<float> scores;
    std::vector<Segment> segments;
    double frameMs;
    int rateHz;
};

std::string asText(Findings const& found) {
    std::string text = "start_s    end_s      length_s\n";
    for (auto const& [start, end] : found.segments) {
        text += formatted("%-10.3f %-10.3f %.3f\n", start / 1000.0, end / 1000.0,
                          (end - start) / 1000.0);
    }
    double const whole = static_cast<double>(found.scores.size()) * found.frameMs;
    text += formatted("%zu segment%s, %.3f s of speech in %.3f s\n", found.segments.size(),
                      found.segments.size() == 1 ? "" : "s", totalMs(found.segments) / 1000.0,
                      whole / 1000.0);
    return text;
}

// One row per frame; `speech` is 1 where the frame's middle lies in a segment.
std::string asCsv(Findings const& found) {
    std::string text = "time_s,score,speech\n";
    auto segment = found.segments.begin();
    for (std::size_t i = 0; i < found.scores.size(); ++i) {
        double const start = static_cast<double>(i) * found.frameMs;
        double const middle = start + found.frameMs / 2;
        while (segment != found.segments.end() && segment->endMs <= middle) ++segment;
        bool const speech = segment != found.segments.end() && segment->startMs <= middle;
        text += formatted("%.3f,%.6f,%d\n", start / 1000.0, static_cast<double>(found.scores[i]),
                          speech);
    }
    return text;
}

nlohmann::ordered_json asJson(Findings const& found, VadOptions const& options) {
    nlohmann::ordered_json page{{"file", options.file.string()},
                                {"sample_rate", found.rateHz},
                                {"frame_ms", found.frameMs},
                                {"threshold", options.rules.threshold},
                                {"release_threshold", options.rules.release},
                                {"min_silence_ms", options.rules.minSilenceMs},
                                {"padding_ms", options.rules.padMs},
                                {"speech_s", totalMs(found.segments) / 1000.0},
                                {"segments", nlohmann::json::array()},
                                {"scores", found.scores}};
    for (auto const& [start, end] : found.segments) {
        page["segments"].push_back({{"start_s", start / 1000.0}, {"end_s", end / 1000.0}});
    }
    return page;
}

int run(VadOptions const& options) {
    options.engine.inputs(options.file).mustNotHold(options.output.file);
    Workbench bench(options.engine);
    auto const sound = readMono(options.file);
    Findings found{.scores = voiceScores(bench, bench.model, sound),
                   .segments = {},
                   .frameMs = static_cast<double>(bench.frameMs),
                   .rateHz = sound.rateHz};
    found.segments = speechSegments(found.scores, found.frameMs, options.rules);
    options.output.write(bench.streams,
                         {[&] { return asText(found); }, [&] { return asCsv(found); },
                          [&] { return asJson(found, options); }});
    return ended(bench.streams, sound);
}

}  // namespace

void addVad(CLI::App& app, Action& action) {
    auto& command =
        *app.add_subcommand("vad", "Find speech: voice score per frame and speech segments");
    auto& options = addOptions(command, action, &run);
    command.add_option("file", options.file, "Sound file; channels are averaged")->required();
    auto const number = [&](char const* name, double& value, char const* meaning) {
        return command.add_option(name, value, meaning)->capture_default_str();
    };
    auto& rules = options.rules;
    number("--threshold", rules.threshold, "Score that starts speech")->check(CLI::Range(0.0, 1.0));
    number("--release-threshold", rules.release, "Score below which speech may end")
        ->check(CLI::Range(0.0, 1.0));
    number("--min-silence", rules.minSilenceMs, "Silence that ends speech, in milliseconds")
        ->check(CLI::NonNegativeNumber);
    number("--padding", rules.padMs, "Added at both ends of a segment, in milliseconds")
        ->check(CLI::NonNegativeNumber);
    addTextOutput(command, options.output);
    addEngineOptions(command, options.engine);
}

}  // namespace morva::cli
