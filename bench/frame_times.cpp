// Distribution of frame times: 1,000,000 frames of 10 ms at 48000 Hz through the full model, and
// what 1000 sessions in one process cost.
//   build/release/morva_frame_times [frames]
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <memory>
#include <string>
#include <vector>

#include "bench_engine.h"
#include "bench_sound.h"

namespace {

using namespace morva_bench;
using Clock = std::chrono::steady_clock;

double microseconds(Clock::time_point from) {
    return std::chrono::duration<double, std::micro>(Clock::now() - from).count();
}

void printDistribution(std::size_t frames) {
    Session session("full", 48000);
    auto const sound = makeSound(Sound::speech, 48000, 10.0);
    std::size_t position = 0;
    std::vector<float> times(frames);
    for (int i = 0; i < 100; ++i) session.clean(sound, position);
    for (auto& time : times) {
        auto const start = Clock::now();
        session.clean(sound, position);
        time = static_cast<float>(microseconds(start));
    }
    std::ranges::sort(times);
    auto const at = [&](double share) {
        return static_cast<double>(times[std::min(
            frames - 1, static_cast<std::size_t>(share * static_cast<double>(frames)))]);
    };
    std::printf("%zu frames of 10 ms, full model at 48000 Hz, microseconds\n", frames);
    std::printf("p50 %.1f  p99 %.1f  p99.9 %.1f  max %.1f\n", at(0.5), at(0.99), at(0.999),
                at(1.0));
}

long residentKib() {
    std::ifstream status("/proc/self/status");
    for (std::string line; std::getline(status, line);) {
        if (line.starts_with("VmRSS:")) return std::atol(line.c_str() + 6);
    }
    return 0;
}

void printSessionCost() {
    constexpr int kSessions = 1000;
    auto const sound = makeSound(Sound::speech, 48000, 1.0);
    std::vector<std::unique_ptr<Session>> sessions;
    long const before = residentKib();
    auto const opened = Clock::now();
    for (int i = 0; i < kSessions; ++i)
        sessions.push_back(std::make_unique<Session>("full", 48000));
    double const openMs = microseconds(opened) / 1000.0;
    auto const started = Clock::now();
    for (auto& session : sessions) {
        std::size_t position = 0;
        for (int frame = 0; frame < 10; ++frame) session->clean(sound, position);
    }
    double const frameUs = microseconds(started) / (10.0 * kSessions);
    std::printf("%d sessions: %.1f KiB each resident, opened in %.1f ms each, %.1f us a frame\n",
                kSessions, static_cast<double>(residentKib() - before) / kSessions,
                openMs / kSessions, frameUs);
}

}  // namespace

int main(int argc, char** argv) {
    startEngine();
    printDistribution(argc > 1 ? std::strtoul(argv[1], nullptr, 10) : 1000000);
    printSessionCost();
    Morva_SDK_GlobalDestroy();
    return 0;
}
