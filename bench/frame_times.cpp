// Distribution of frame times: 1,000,000 frames of 10 ms at 48000 Hz through the full model; what
// other sounds than speech cost; and what 1000 sessions in one process cost.
//   build/release/morva_frame_times [frames]
#include <algorithm>
#include <array>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <memory>
#include <string>
#include <vector>

#include "bench_engine.h"
#include "bench_sound.h"
#include "cpu_clock.h"

namespace {

using namespace morva_bench;
using Clock = std::chrono::steady_clock;

double microseconds(Clock::time_point from) {
    return std::chrono::duration<double, std::micro>(Clock::now() - from).count();
}

void printPercentiles(char const* what, std::vector<float>& times) {
    std::ranges::sort(times);
    auto const at = [&](double share) {
        auto const index = static_cast<std::size_t>(share * static_cast<double>(times.size()));
        return static_cast<double>(times[std::min(times.size() - 1, index)]);
    };
    std::printf("%-15s p50 %.1f  p99 %.1f  p99.9 %.1f  max %.1f\n", what, at(0.5), at(0.99),
                at(0.999), at(1.0));
}

void printDistribution(std::size_t frames) {
    Session session("full_NC-ca03f4", 48000);
    auto const sound = makeSound(Sound::speech, 48000, 10.0);
    std::size_t position = 0;
    std::vector<float> elapsed(frames);
    std::vector<float> used(frames);
    for (int i = 0; i < 100; ++i) session.clean(sound, position);
    for (std::size_t i = 0; i < frames; ++i) {
        auto const start = Clock::now();
        double const cpuStart = cpuSeconds();
        session.clean(sound, position);
        used[i] = static_cast<float>(1e6 * (cpuSeconds() - cpuStart));
        elapsed[i] = static_cast<float>(microseconds(start));
    }
    std::printf("%zu frames of 10 ms, full model at 48000 Hz, microseconds\n", frames);
    printPercentiles("processor time", used);
    printPercentiles("elapsed time", elapsed);
}

// Silence, denormals and clipping against speech, interleaved second by second.
void printSoundRatios() {
    constexpr Sound kKinds[] = {Sound::speech, Sound::silence, Sound::denormal, Sound::clipped};
    constexpr int kRounds = 31;
    std::printf("\ncost relative to speech     silence  denormal   clipped\n");
    for (auto const& model : morva::shippedModels) {
        if (model.kind != morva::ShippedKind::NC) continue;
        std::array<std::vector<double>, std::size(kKinds)> costs;
        std::array<std::unique_ptr<Session>, std::size(kKinds)> sessions;
        std::array<std::vector<float>, std::size(kKinds)> sounds;
        for (std::size_t k = 0; k < std::size(kKinds); ++k) {
            sessions[k] = std::make_unique<Session>(model.name, 48000);
            sounds[k] = makeSound(kKinds[k], 48000, 1.0);
        }
        for (int round = 0; round < kRounds; ++round) {
            for (std::size_t k = 0; k < std::size(kKinds); ++k) {
                double const start = cpuSeconds();
                std::size_t position = 0;
                for (int i = 0; i < 100; ++i) sessions[k]->clean(sounds[k], position);
                costs[k].push_back(cpuSeconds() - start);
            }
        }
        for (auto& cost : costs) std::ranges::nth_element(cost, cost.begin() + kRounds / 2);
        double const speech = costs[0][kRounds / 2];
        std::printf("%-24s %10.2f %9.2f %9.2f\n", model.name, costs[1][kRounds / 2] / speech,
                    costs[2][kRounds / 2] / speech, costs[3][kRounds / 2] / speech);
    }
    std::printf("\n");
}

void printSessionCost() {
    constexpr int kSessions = 1000;
    auto const sound = makeSound(Sound::speech, 48000, 1.0);
    std::vector<std::unique_ptr<Session>> sessions;
    long const before = residentKib();
    double const opened = cpuSeconds();
    for (int i = 0; i < kSessions; ++i)
        sessions.push_back(std::make_unique<Session>("full_NC-ca03f4", 48000));
    double const openMs = 1e3 * (cpuSeconds() - opened);
    double const started = cpuSeconds();
    for (auto& session : sessions) {
        std::size_t position = 0;
        for (int frame = 0; frame < 10; ++frame) session->clean(sound, position);
    }
    double const frameUs = 1e6 * (cpuSeconds() - started) / (10.0 * kSessions);
    std::printf("%d sessions: %.1f KiB each resident, opened in %.1f ms each, %.1f us a frame\n",
                kSessions, static_cast<double>(residentKib() - before) / kSessions,
                openMs / kSessions, frameUs);
}

}  // namespace

int main(int argc, char** argv) {
    startEngine();
    printDistribution(argc > 1 ? std::strtoul(argv[1], nullptr, 10) : 1000000);
    printSoundRatios();
    printSessionCost();
    Morva_SDK_GlobalDestroy();
    return 0;
}
