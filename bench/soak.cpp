// Soak: hours of simulated sound through every shipped model at once. Resumable: a state file keeps
// what has been done. After each piece it checks that
//   - memory is flat: resident size grows by at most 2 MiB over the size after the first piece;
//   - a new session gives what the very first one gave, to the bit, and a noise-level session after
//     its reset does as well;
//   - latency has not drifted: with bypass on, the output is the input delayed by exactly
//     MorvaExt_SessionLatencySamples.
//   build/release/morva_soak STATE_FILE HOURS
#include <algorithm>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <iterator>
#include <memory>
#include <random>
#include <string>
#include <utility>
#include <vector>

#include "bench_engine.h"
#include "bench_sound.h"
#include "cpu_clock.h"

namespace {

using namespace morva_bench;

constexpr double kPieceSeconds = 360.0;  // per model, between two checks
constexpr long kMemorySlackKib = 2048;

struct Place {
    char const* model;
    int rate;
};
constexpr Place kPlaces[] = {{"full_NC-ca03f4", 48000}, {"full_NC-ca03f4", 44100},
                             {"small_NC", 16000},       {"small_NC", 48000},
                             {"small_NC_8k", 8000},     {"small_NC_8k", 96000}};
constexpr int kValueRate = 16000;
constexpr double kModels = std::size(kPlaces) + 2.0;  // and voice activity, noise level

[[noreturn]] void fail(std::string const& what) {
    std::printf("FAILED: %s\n", what.c_str());
    std::exit(1);
}

// Speech, music-like tones, noise, silence, clicks, clipping, denormals and broken samples by
// turns.
class MixedSound {
public:
    explicit MixedSound(int rate, unsigned seed)
        : random_(seed), speech_(makeSound(Sound::speech, rate, 8.0)) {}

    void fill(std::vector<float>& frame) {
        if (left_ == 0) {
            kind_ = static_cast<int>(random_() % 8);
            gain_ = std::pow(10.0f, -static_cast<float>(random_() % 60) / 20.0f);
            left_ = 20 + random_() % 500;
        }
        --left_;
        for (float& sample : frame) {
            at_ = at_ + 1 == speech_.size() ? 0 : at_ + 1;
            sample = gain_ * next();
        }
    }

private:
    float next() {
        auto const noise = static_cast<float>(random_()) / 2147483648.0f - 1.0f;
        switch (kind_) {
            case 0:
                return 0.0f;
            case 1:
                return noise;
            case 2:
                return random_() % 4000 == 0 ? 1.0f : 0.0f;
            case 3:
                return speech_[at_] > 0.0f ? 1.0f : -1.0f;
            case 4:
                return speech_[at_] * 1e-38f;
            case 5:
                return random_() % 1000 == 0 ? NAN : speech_[at_];
            default:
                return speech_[at_] + 0.05f * noise;
        }
    }

    std::mt19937 random_;
    std::vector<float> speech_;
    std::size_t at_ = 0;
    std::size_t left_ = 0;
    int kind_ = 0;
    float gain_ = 1.0f;
};

class NoiseStream {
public:
    NoiseStream(Place place, unsigned seed)
        : place_(place),
          handle_(open(place)),
          sound_(place.rate, seed),
          in_(frameSize()),
          out_(frameSize()) {}
    ~NoiseStream() { Morva_NC_CloseSession(handle_); }
    NoiseStream(NoiseStream const&) = delete;
    NoiseStream& operator=(NoiseStream const&) = delete;

    void run(double seconds) {
        for (double t = 0.0; t < seconds; t += 0.01) {
            sound_.fill(in_);
            clean();
            for (float const sample : out_) {
                if (!(sample >= -1.0f && sample <= 1.0f)) fail("an output sample out of range");
            }
        }
    }

    // Only where both rates are equal and the bypass therefore changes no sample.
    void checkLatency() {
        auto const latency = static_cast<std::size_t>(MorvaExt_SessionLatencySamples(handle_));
        std::mt19937 random(5);
        std::vector<float> sent;
        std::vector<float> received;
        MorvaExt_NC_SetBypass(handle_, 1);
        for (int i = 0; i < 50; ++i) {
            for (float& sample : in_)
                sample = static_cast<float>(random() % 60000) / 32768.0f - 0.9f;
            clean();
            sent.insert(sent.end(), in_.begin(), in_.end());
            received.insert(received.end(), out_.begin(), out_.end());
        }
        MorvaExt_NC_SetBypass(handle_, 0);
        for (std::size_t i = latency + 2 * in_.size(); i < sent.size(); ++i) {
            if (received[i] != std::min(sent[i - latency], 32767.0f / 32768.0f)) {
                fail(std::string("latency of ") + place_.model + " at " +
                     std::to_string(place_.rate));
            }
        }
    }

    // What a new session makes of a fixed sound.
    static std::vector<float> fresh(Place place) {
        NoiseStream stream(place, 99);
        std::vector<float> all;
        for (int i = 0; i < 200; ++i) {
            stream.sound_.fill(stream.in_);
            stream.clean();
            all.insert(all.end(), stream.out_.begin(), stream.out_.end());
        }
        return all;
    }

private:
    static void* open(Place place) {
        auto const rate = static_cast<MorvaSamplingRate>(place.rate);
        auto* const handle = Morva_NC_CreateSession(rate, rate, MORVA_FRAME_10_MS, place.model);
        if (handle == nullptr) fail("a session does not open");
        return handle;
    }
    std::size_t frameSize() const { return static_cast<std::size_t>(place_.rate / 100); }
    void clean() {
        auto const size = static_cast<unsigned>(in_.size());
        if (Morva_NC_CleanAmbientNoiseFloat(handle_, in_.data(), size, out_.data(), size) != 0) {
            fail("a frame is refused");
        }
    }

    Place place_;
    void* handle_;
    MixedSound sound_;
    std::vector<float> in_;
    std::vector<float> out_;
};

// A session that answers with one value per frame; `kind` is 'v'oice or 'l'evel.
class ValueStream {
public:
    ValueStream(char kind, unsigned seed)
        : kind_(kind), handle_(open(kind)), sound_(kValueRate, seed) {}
    ~ValueStream() {
        kind_ == 'v' ? Morva_VAD_CloseSession(handle_) : Morva_NoiseDB_CloseSession(handle_);
    }
    ValueStream(ValueStream const&) = delete;
    ValueStream& operator=(ValueStream const&) = delete;

    void run(double seconds) {
        for (double t = 0.0; t < seconds; t += 0.01) value();
    }
    void reset() { Morva_NoiseDB_ResetSession(handle_); }
    std::vector<float> values(unsigned seed) {
        sound_ = MixedSound(kValueRate, seed);
        std::vector<float> all(200);
        std::ranges::generate(all, [&] { return value(); });
        return all;
    }

private:
    static void* open(char kind) {
        auto const rate = static_cast<MorvaSamplingRate>(kValueRate);
        auto* const handle =
            kind == 'v' ? Morva_VAD_CreateSession(rate, MORVA_FRAME_10_MS, "default_VAD")
                        : Morva_NoiseDB_CreateSession(rate, MORVA_FRAME_10_MS, "noise_level");
        if (handle == nullptr) fail("a session does not open");
        return handle;
    }
    float value() {
        sound_.fill(in_);
        std::ranges::transform(in_, pcm_.begin(), [](float x) {
            return static_cast<short>(32767.0f * (x == x ? std::clamp(x, -1.0f, 1.0f) : 0.0f));
        });
        auto const size = static_cast<unsigned>(pcm_.size());
        float const value = kind_ == 'v' ? Morva_VAD_FrameInt16(handle_, pcm_.data(), size)
                                         : Morva_NoiseDB_FrameInt16(handle_, pcm_.data(), size);
        if (!std::isfinite(value)) fail("a value that is not finite");
        return value;
    }

    char kind_;
    void* handle_;
    MixedSound sound_;
    std::vector<float> in_ = std::vector<float>(kValueRate / 100);
    std::vector<short> pcm_ = std::vector<short>(kValueRate / 100);
};

std::vector<std::vector<float>> freshOutputs() {
    std::vector<std::vector<float>> all;
    for (auto const& place : kPlaces) all.push_back(NoiseStream::fresh(place));
    for (char const kind : {'v', 'l'}) all.push_back(ValueStream(kind, 1).values(99));
    return all;
}

struct Progress {
    double hours = 0.0;
    double cpuHours = 0.0;
    unsigned pieces = 0;

    static Progress load(std::string const& file) {
        Progress progress;
        std::ifstream(file) >> progress.hours >> progress.cpuHours >> progress.pieces;
        return progress;
    }
    void save(std::string const& file) const {
        std::ofstream(file) << hours << ' ' << cpuHours << ' ' << pieces << '\n';
    }
};

void soak(std::string const& stateFile, double hours) {
    auto progress = Progress::load(stateFile);
    std::vector<std::unique_ptr<NoiseStream>> streams;
    for (auto const& place : kPlaces) {
        streams.push_back(std::make_unique<NoiseStream>(place, 1000 + progress.pieces));
    }
    ValueStream voice('v', 2000 + progress.pieces);
    ValueStream level('l', 3000 + progress.pieces);
    auto const wanted = freshOutputs();
    long memory = 0;
    while (progress.hours < hours) {
        double const start = cpuSeconds();
        for (auto& stream : streams) stream->run(kPieceSeconds);
        voice.run(kPieceSeconds);
        level.run(kPieceSeconds);

        for (auto& stream : streams) stream->checkLatency();
        if (freshOutputs() != wanted) fail("a new session differs from the first one");
        level.reset();
        if (level.values(99) != wanted.back()) fail("a reset session differs from a new one");
        long const now = residentKib();
        if (memory == 0) memory = now;
        if (now > memory + kMemorySlackKib) fail("memory grew to " + std::to_string(now) + " KiB");

        progress.hours += kModels * kPieceSeconds / 3600.0;
        progress.cpuHours += (cpuSeconds() - start) / 3600.0;
        ++progress.pieces;
        progress.save(stateFile);
        std::printf("%.1f simulated hours, %.3f hours of processor, %ld KiB resident\n",
                    progress.hours, progress.cpuHours, now);
        std::fflush(stdout);
    }
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 3) {
        std::puts("usage: morva_soak STATE_FILE HOURS");
        return 2;
    }
    startEngine();
    soak(argv[1], std::strtod(argv[2], nullptr));
    Morva_SDK_GlobalDestroy();
    return 0;
}
