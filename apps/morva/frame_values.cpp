#include "frame_values.h"

#include <algorithm>
#include <numeric>
#include <span>

#include "audio_file.h"
#include "error.h"
#include "rate_converter.h"

namespace morva::cli {
namespace {

constexpr std::size_t framesPerRead = 4096;

template <class ValueOf>
std::vector<float> forEachFrame(MonoSound const& sound, SessionSetup const& setup,
                                ValueOf valueOf) {
    auto const size = setup.frameSize();
    RateConverter converter(sound.rateHz, setup.rateHz);
    std::vector<float> samples;
    converter.push(sound.samples, samples);
    converter.finish(samples);
    samples.resize((samples.size() + size - 1) / size * size);
    std::vector<float> values;
    for (std::size_t at = 0; at < samples.size(); at += size)
        values.push_back(valueOf(std::span(samples).subspan(at, size)));
    return values;
}

}  // namespace

MonoSound readMono(std::filesystem::path const& file, double maxSeconds) {
    SoundReader reader(file);
    auto const channels = static_cast<std::size_t>(reader.channels());
    auto const limit = maxSeconds > 0.0 ? static_cast<std::size_t>(maxSeconds * reader.rateHz())
                                        : static_cast<std::size_t>(-1);
    MonoSound sound{.name = spokenInput(file),
                    .rateHz = reader.rateHz(),
                    .samples = {},
                    .channels = reader.channels(),
                    .isWhole = true,
                    .damage = {}};
    std::vector<float> block(framesPerRead * channels);
    while (sound.samples.size() <= limit) {
        auto const frames = reader.read(block);
        if (frames == 0) break;
        for (std::size_t i = 0; i < frames; ++i) {
            auto const frame = std::span(block).subspan(i * channels, channels);
            sound.samples.push_back(std::accumulate(frame.begin(), frame.end(), 0.0F) /
                                    static_cast<float>(channels));
        }
    }
    sound.isWhole = sound.samples.size() <= limit;
    sound.samples.resize(std::min(sound.samples.size(), limit));
    sound.damage = reader.damage();
    return sound;
}

int ended(Streams& streams, MonoSound const& sound) {
    if (sound.damage.empty()) return done;
    streams.err("morva: " + sound.damage + '\n');
    return incomplete;
}

std::vector<float> voiceScores(Workbench& bench, ModelFiles const& model, MonoSound const& sound) {
    auto const setup = bench.setup(ShippedKind::VAD, model, sound.name, sound.rateHz);
    VoiceSession session(bench.engine, setup);
    return forEachFrame(sound, setup, [&](auto frame) { return session.score(frame); });
}

std::vector<float> noiseLevels(Workbench& bench, ModelFiles const& model, MonoSound const& sound) {
    auto const setup = bench.setup(ShippedKind::NoiseDB, model, sound.name, sound.rateHz);
    LevelSession session(bench.engine, setup);
    return forEachFrame(sound, setup, [&](auto frame) { return session.level(frame); });
}

}  // namespace morva::cli
