// morva report: one page that shows and plays a sound before and after cleaning.
#include <algorithm>
#include <fstream>
#include <string>

#include "audio_file.h"
#include "channel_cleaner.h"
#include "command.h"
#include "error.h"
#include "frame_values.h"
#include "rates.h"
#include "report_page.h"
#include "text_output.h"

namespace morva::cli {
namespace {

struct ReportOptions {
    EngineOptions engine;
    std::filesystem::path file;
    std::filesystem::path page;
    std::filesystem::path vadModel;
    std::filesystem::path levelModel;
    double maxSeconds = 600.0;
};

std::vector<float> cleaned(Engine& engine, Models& models, std::string const& name,
                           MonoSound const& sound, int frameMs) {
    int const rateHz = requireEngineRate(name, sound.rateHz);
    ChannelCleaner cleaner(engine, sound.rateHz, {rateHz, frameMs, models.cleaning(sound.rateHz)});
    std::vector<float> out;
    cleaner.push(sound.samples, out);
    cleaner.finish(out);
    return out;
}

// A plot whose model is not there is left out and the page says why; a model that was named must
// work.
template <class Measure>
std::vector<float> orNote(Report& report, bool named, char const* what, Measure const& measure) {
    try {
        return measure();
    } catch (Error const& error) {
        if (named) throw;
        report.notes.push_back(std::string(what) + " left out: " + error.what() + '.');
        return {};
    }
}

Report measured(Streams& streams, ReportOptions const& options) {
    auto const& models = options.engine.models;
    int const frameMs = options.engine.frameMs;
    auto const name = options.file.string();
    auto sound = readMono(options.file, options.maxSeconds);
    Engine engine(streams, controlFolder(models));
    Models cleaning(engine, models);
    Models voice(engine, {.model = options.vadModel, .control = {}, .folder = models.folder});
    Models level(engine, {.model = options.levelModel, .control = {}, .folder = models.folder});

    Report report{.file = options.file.filename().string(),
                  .rateHz = sound.rateHz,
                  .frameMs = frameMs,
                  .before = {},
                  .after = cleaned(engine, cleaning, name, sound, frameMs),
                  .scores = {},
                  .segments = {},
                  .rules = {},
                  .levelsDb = {},
                  .notes = {}};
    report.scores = orNote(report, !options.vadModel.empty(), "Voice score",
                           [&] { return voiceScores(engine, voice, name, sound, frameMs); });
    report.segments = speechSegments(report.scores, frameMs, report.rules);
    report.levelsDb = orNote(report, !options.levelModel.empty(), "Noise level",
                             [&] { return noiseLevels(engine, level, name, sound, frameMs); });
    for (float& value : report.levelsDb) value -= static_cast<float>(fullScaleDb);
    report.before = std::move(sound.samples);
    return report;
}

int run(ReportOptions const& options) {
    std::error_code ignored;
    if (std::filesystem::equivalent(options.file, options.page, ignored)) {
        throw Error(options.page.string() + ": is the input; choose another output");
    }
    Streams streams(options.engine.verbose);
    auto report = measured(streams, options);
    SoundReader const header(options.file);
    if (header.channels() > 1) report.notes.push_back("Channels were averaged.");
    if (header.frames() > static_cast<std::int64_t>(report.before.size())) {
        report.notes.push_back(formatted("Only the first %g s are shown.", options.maxSeconds));
    }
    TextOutput{options.page, {}}.write(streams, renderPage(report));
    for (auto const& note : report.notes) streams.err("morva: " + note + '\n');
    return 0;
}

}  // namespace

void addReport(CLI::App& app, Action& action) {
    auto const options = std::make_shared<ReportOptions>();
    auto* command =
        app.add_subcommand("report", "Write a page that shows and plays a file before and after");
    command->add_option("file", options->file, "Sound file; channels are averaged")->required();
    command->add_option("page", options->page, "HTML file to write")->required();
    command->add_option("--vad-model", options->vadModel, "Voice-activity weight")
        ->type_name("FILE");
    command->add_option("--level-model", options->levelModel, "Noise-level weight")
        ->type_name("FILE");
    command
        ->add_option("--max-seconds", options->maxSeconds,
                     "Length shown, from the start; 0 shows all")
        ->check(CLI::NonNegativeNumber)
        ->capture_default_str();
    addEngineOptions(*command, options->engine);
    command->callback([options, &action] { action = [options] { return run(*options); }; });
}

}  // namespace morva::cli
