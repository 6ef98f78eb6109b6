// morva report: one page that shows and plays a sound before and after cleaning.
#include <algorithm>
#include <string>

#include "channel_cleaner.h"
#include "command.h"
#include "error.h"
#include "frame_values.h"
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

std::vector<float> cleaned(Workbench& bench, MonoSound const& sound) {
    ChannelCleaner cleaner(bench.engine, sound.rateHz,
                           bench.setup(ShippedKind::NC, bench.model, sound.name, sound.rateHz));
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

Report measured(Workbench& bench, ReportOptions const& options) {
    auto sound = readMono(options.file, options.maxSeconds);
    auto const voice = modelFiles({options.vadModel, {}});
    auto const level = modelFiles({options.levelModel, {}});
    Report report{.file = options.file.filename().string(),
                  .rateHz = sound.rateHz,
                  .frameMs = bench.frameMs,
                  .before = {},
                  .after = cleaned(bench, sound),
                  .scores = {},
                  .segments = {},
                  .rules = {},
                  .levelsDb = {},
                  .notes = {},
                  .isDamaged = false};
    report.scores = orNote(report, !options.vadModel.empty(), "Voice score",
                           [&] { return voiceScores(bench, voice, sound); });
    report.segments = speechSegments(report.scores, report.frameMs, report.rules);
    report.levelsDb = orNote(report, !options.levelModel.empty(), "Noise level",
                             [&] { return noiseLevels(bench, level, sound); });
    for (float& value : report.levelsDb) value -= static_cast<float>(fullScaleDb);
    report.before = std::move(sound.samples);
    if (sound.channels > 1) report.notes.push_back("Channels were averaged.");
    if (!sound.isWhole)
        report.notes.push_back(formatted("Only the first %g s are shown.", options.maxSeconds));
    report.isDamaged = !sound.damage.empty();
    if (report.isDamaged) report.notes.push_back(sound.damage);
    return report;
}

int run(ReportOptions const& options) {
    auto inputs = options.engine.inputs(options.file);
    inputs.add(options.vadModel);
    inputs.add(options.levelModel);
    inputs.mustNotHold(options.page);
    Workbench bench(options.engine);
    auto report = measured(bench, options);
    TextOutput{options.page, {}}.write(bench.streams, renderPage(report));
    for (auto const& note : report.notes) bench.streams.err("morva: " + note + '\n');
    return report.isDamaged ? incomplete : done;
}

}  // namespace

void addReport(CLI::App& app, Action& action) {
    auto& command =
        *app.add_subcommand("report", "Write a page that shows and plays a file before and after");
    auto& options = addOptions(command, action, &run);
    command.add_option("file", options.file, "Sound file; channels are averaged")->required();
    command.add_option("page", options.page, "HTML file to write")->required();
    command.add_option("--vad-model", options.vadModel, "Voice-activity weight")->type_name("FILE");
    command.add_option("--level-model", options.levelModel, "Noise-level weight")
        ->type_name("FILE");
    command
        .add_option("--max-seconds", options.maxSeconds,
                    "Length shown, from the start; 0 shows all")
        ->check(CLI::NonNegativeNumber)
        ->capture_default_str();
    addLimit(command, options.engine);
    addEngineOptions(command, options.engine);
}

}  // namespace morva::cli
