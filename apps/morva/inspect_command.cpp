// morva inspect: what a weight file holds, what the model is, what it costs and how late its sound
// is.
#include <string>
#include <vector>

#include "command.h"
#include "error.h"
#include "output_file.h"
#include "text_output.h"
#include "weight_facts.h"

namespace morva::cli {
namespace {

struct InspectOptions {
    std::filesystem::path file;
    std::filesystem::path output;
    int frameMs = 10;
    bool json = false;
    bool verbose = false;
};

// What the engine says about the model: the latency of cleaned sound, or why it will not run it.
struct Trial {
    bool runs = false;
    std::string reason;
    std::optional<double> latencyMs;
};

char const* nameOf(ModelKind kind) {
    switch (kind) {
        case ModelKind::noiseCancellation:
            return "noise cancellation";
        case ModelKind::voiceActivity:
            return "voice activity";
        case ModelKind::unknown:
            break;
    }
    return "unknown";
}

Trial tryOut(Engine& engine, std::filesystem::path const& file, WeightFacts const& facts,
             int frameMs) {
    try {
        engine.addModel(std::filesystem::absolute(file), file.filename().string());
        SessionSetup const setup{facts.sampleRateHz.value_or(16000), frameMs,
                                 file.filename().string()};
        if (facts.kind == ModelKind::voiceActivity) {
            VoiceSession const session(engine, setup);
            return {true, "", std::nullopt};
        }
        CleaningSession const session(engine, setup);
        return {true, "", session.latency() * 1000.0 / setup.rateHz};
    } catch (Error const& error) {
        return {false, error.what(), std::nullopt};
    }
}

nlohmann::ordered_json asJson(InspectOptions const& options, WeightFacts const& facts,
                              Trial const& trial) {
    auto const orNull = [](auto const& value) {
        return value ? nlohmann::ordered_json(*value) : nullptr;
    };
    nlohmann::ordered_json page{
        {"file", options.file.string()},
        {"kind", nameOf(facts.kind)},
        {"version", facts.version},
        {"model_name", facts.modelName},
        {"time_stamp", facts.timeStamp},
        {"sample_rate", orNull(facts.sampleRateHz)},
        {"frame_length", orNull(facts.frameLength)},
        {"step", orNull(facts.hop)},
        {"parameters", facts.parameters},
        {"multiply_adds_per_second", orNull(multiplyAddsPerSecond(facts, options.frameMs))},
        {"session_frame_ms", options.frameMs},
        {"latency_ms", orNull(trial.latencyMs)},
        {"runs", trial.runs},
        {"reason", trial.reason},
        {"values", nlohmann::ordered_json::array()}};
    for (auto const& value : facts.values) {
        nlohmann::ordered_json entry{{"name", value.name}, {"type", value.type}};
        if (!value.shape.empty()) entry["shape"] = value.shape;
        if (!value.text.empty()) entry["value"] = value.text;
        if (value.count > 0) {
            entry["min"] = value.lowest;
            entry["max"] = value.highest;
            entry["mean"] = value.mean;
        }
        if (value.notFinite > 0) entry["not_finite"] = value.notFinite;
        page["values"].push_back(std::move(entry));
    }
    return page;
}

// A value or name from the file, without anything that would steer a terminal.
std::string printable(std::string text) {
    for (char& c : text) {
        if (static_cast<unsigned char>(c) < 0x20 || c == 0x7f) c = '?';
    }
    return text;
}

std::string asText(InspectOptions const& options, WeightFacts const& facts, Trial const& trial) {
    auto const known = [](auto const& value) {
        return value ? std::to_string(*value) : std::string("?");
    };
    std::string text = options.file.string() + '\n';
    text +=
        formatted("  %s, version \"%s\"\n", nameOf(facts.kind), printable(facts.version).c_str());
    if (!facts.modelName.empty() || !facts.timeStamp.empty()) {
        text += "  name \"" + printable(facts.modelName) + "\", made " +
                printable(facts.timeStamp) + '\n';
    }
    text += "  rate " + known(facts.sampleRateHz) + " Hz, frame " + known(facts.frameLength) +
            " samples";
    text += facts.hop ? ", hop " + known(facts.hop) + " samples\n" : ", hop one session frame\n";
    text += formatted("  %zu parameters", facts.parameters);
    if (auto const cost = multiplyAddsPerSecond(facts, options.frameMs)) {
        text += formatted(", %.1f million multiply-adds per second of audio", *cost / 1e6);
    }
    text += '\n';
    if (trial.latencyMs) {
        text += formatted("  output lags the input by %.1f ms with %d ms calls at its own rate\n",
                          *trial.latencyMs, options.frameMs);
    }
    if (!trial.runs) text += "  DOES NOT RUN: " + trial.reason + '\n';
    text += '\n';
    std::size_t width = 4;
    for (auto const& value : facts.values)
        width = std::max(width, std::min<std::size_t>(value.name.size(), 60));
    for (auto const& value : facts.values) {
        auto line = formatted("%-*s  %-8s  ", static_cast<int>(width),
                              printable(value.name).c_str(), value.type.c_str());
        line += value.text.empty() ? value.shape : printable(value.text);
        if (!value.shape.empty() && value.count > 0) {
            line +=
                formatted("  [%.4g .. %.4g], mean %.4g", value.lowest, value.highest, value.mean);
        }
        if (value.notFinite > 0) line += formatted(", %zu NOT FINITE", value.notFinite);
        text += line + '\n';
    }
    return text;
}

int run(InspectOptions const& options) {
    InputFiles{options.file}.mustNotHold(options.output);
    Streams streams(options.verbose);
    Engine engine;
    if (!std::filesystem::is_regular_file(options.file)) {
        throw Error(options.file.string() + ": no such file");
    }
    auto const facts = readWeightFacts(options.file);
    auto const trial = tryOut(engine, options.file, facts, options.frameMs);
    TextOutput const output{options.output, options.json ? "json" : "text"};
    output.write(streams, {[&] { return asText(options, facts, trial); },
                           {},
                           [&] { return asJson(options, facts, trial); }});
    if (!trial.runs) streams.err("morva: " + trial.reason + '\n');
    return trial.runs ? done : failed;
}

}  // namespace

void addInspect(CLI::App& app, Action& action) {
    auto& command = *app.add_subcommand("inspect", "Describe a weight file (.mvw)");
    auto& options = addOptions(command, action, &run);
    command.add_option("file", options.file, "Weight file")->required();
    command.add_option("-o,--output", options.output, "File to write instead of standard output");
    command.add_flag("--json", options.json, "As JSON");
    addFrameOptions(command, options.frameMs, options.verbose);
}

}  // namespace morva::cli
