// What a second of sound costs: this engine and its peers, interleaved in one run on one thread.
//   build/release/morva_peers [--model FILE] [--rnnoise LABEL=LIBRARY] [--command LABEL=COMMAND]
//                             [--rounds N]
// Times are processor time of the thread, so that other work on the machine only adds the noise of
// shared caches; a round runs one second of sound through everyone in turn.
#include <CLI/CLI.hpp>
#include <algorithm>
#include <cstdio>
#include <utility>

#include "bench_sound.h"
#include "command_peer.h"
#include "cpu_clock.h"
#include "floor.h"
#include "subject.h"

namespace {

using namespace morva_bench;

struct Line {
    std::string name;
    int rate;
    std::vector<double> costs;  // processor seconds per second of sound, one per round
};

double median(std::vector<double> values) {
    std::ranges::sort(values);
    return values.empty() ? 0.0 : values[values.size() / 2];
}

double costOfASecond(Contestant& contestant, std::vector<float> const& sound, int round) {
    auto const frame = static_cast<std::size_t>(contestant.rate / 100);
    std::size_t const seconds = sound.size() / (100 * frame);
    float const* at = sound.data() + static_cast<std::size_t>(round) % seconds * 100 * frame;
    double const start = cpuSeconds();
    for (int i = 0; i < 100; ++i, at += frame) contestant.subject->frame(at);
    return cpuSeconds() - start;
}

std::pair<std::string, std::string> splitLabel(std::string const& text) {
    auto const equals = text.find('=');
    if (equals == std::string::npos) return {text, text};
    return {text.substr(0, equals), text.substr(equals + 1)};
}

std::vector<Line> race(Contestants& all, Machine& machine, int rounds) {
    std::vector<Line> lines;
    std::vector<std::vector<float>> sounds;
    for (auto const& contestant : all) {
        lines.push_back({contestant.name, contestant.rate, {}});
        sounds.push_back(makeSound(Sound::speech, contestant.rate, 4.0));
    }
    for (int round = -1; round < rounds; ++round) {  // the first one warms up
        for (std::size_t i = 0; i < all.size(); ++i) {
            double const cost = costOfASecond(all[i], sounds[i], round + 1);
            if (round >= 0) lines[i].costs.push_back(cost);
        }
        if (round % 10 == 0) machine.measure();
    }
    return lines;
}

// Everyone relative to the first peer that the user named, else to the first line.
void print(std::vector<Line> const& lines, std::string const& reference) {
    auto base = std::ranges::find(lines, reference, &Line::name);
    if (base == lines.end()) base = lines.begin();
    std::printf("\n%-34s %6s %10s %10s %8s\n", "", "Hz", "median", "best", "ratio");
    for (auto const& line : lines) {
        std::printf("%-34s %6d %10.5f %10.5f %8.2f\n", line.name.c_str(), line.rate,
                    median(line.costs), std::ranges::min(line.costs),
                    median(line.costs) / median(base->costs));
    }
    std::printf("processor seconds per second of sound; ratio of medians to: %s\n",
                base->name.c_str());
}

void printFloor(std::vector<Line> const& lines, Machine const& machine) {
    std::printf("\nmeasured: %.1f GB/s from memory, %.1f GFLOP/s\n",
                machine.memoryBytesPerSecond() / 1e9, machine.operationsPerSecond() / 1e9);
    for (auto const& work : {frameWork("full_NC-ca03f4", "c6.xs.f.ca03f4.mvw", 48000),
                             frameWork("small_NC", "NC_small_16k.mvw", 16000)}) {
        auto const line = std::ranges::find_if(lines, [&](Line const& candidate) {
            return candidate.name == "this engine, " + work.model && candidate.rate == work.rate;
        });
        double const cacheRate = machine.bytesPerSecond(work);
        double const cached = 100.0 * machine.floor(work, cacheRate);
        double const memory = 100.0 * machine.floor(work, machine.memoryBytesPerSecond());
        std::printf("%s at %d Hz: %zu parameters, %.0f KiB and %.2f MFLOP a frame\n",
                    work.model.c_str(), work.rate, work.parameters, work.weightBytes / 1024.0,
                    work.operations / 1e6);
        std::printf(
            "  floor %.5f with weights in the cache (%.1f GB/s), %.5f from memory; measured "
            "%.2f x and %.2f x of them\n",
            cached, cacheRate / 1e9, memory, median(line->costs) / cached,
            median(line->costs) / memory);
    }
}

}  // namespace

int main(int argc, char** argv) {
    CLI::App app("Processor time of this engine and of its peers");
    std::vector<std::string> models;
    std::vector<std::string> libraries;
    std::vector<std::string> commands;
    int rounds = 60;
    app.add_option("--model", models, "FILE.mvw of one more of our noise models; repeatable");
    app.add_option("--rnnoise", libraries, "LABEL=PATH of a native RNNoise library; repeatable");
    app.add_option("--command", commands, "LABEL=COMMAND, called with in.wav out.wav; repeatable");
    app.add_option("--rounds", rounds, "seconds of sound for everyone")->check(CLI::PositiveNumber);
    CLI11_PARSE(app, argc, argv);

    Contestants all;
    addOurs(all, models);
    std::string reference;
    if (libraries.empty()) std::puts("skipped: RNNoise, no --rnnoise LABEL=LIBRARY given");
    for (auto const& library : libraries) {
        auto const [label, path] = splitLabel(library);
        if (reference.empty()) reference = label;
        addRnnoise(all, label, path);
    }
    addSpeexDsp(all);
    addWebRtc(all);
    Machine machine;
    auto lines = race(all, machine, rounds);
    for (auto const& command : commands) {
        auto const [label, line] = splitLabel(command);
        double const cost = commandCost(line);
        if (cost < 0.0) {
            std::printf("skipped: %s, the command failed\n", label.c_str());
        } else {
            lines.push_back({label, 48000, {cost}});
        }
    }
    print(lines, reference);
    printFloor(lines, machine);
    return 0;
}
