#include "mono_frames.h"

#include <algorithm>
#include <numeric>

#include "audio_file.h"
#include "rate_converter.h"
#include "rates.h"

namespace morva::cli {
namespace {
constexpr std::size_t framesPerRead = 4096;
}

MonoSound readMono(std::filesystem::path const& file, double maxSeconds) {
    SoundReader reader(file);
    auto const channels = static_cast<std::size_t>(reader.channels());
    auto const limit = maxSeconds > 0.0 ? static_cast<std::size_t>(maxSeconds * reader.rateHz())
                                        : static_cast<std::size_t>(-1);
    MonoSound sound{reader.rateHz(), {}};
    std::vector<float> block(framesPerRead * channels);
    while (sound.samples.size() < limit) {
        auto const frames = reader.read(block);
        if (frames == 0) break;
        for (std::size_t i = 0; i < frames; ++i) {
            auto const first = block.begin() + static_cast<std::ptrdiff_t>(i * channels);
            float const sum =
                std::accumulate(first, first + static_cast<std::ptrdiff_t>(channels), 0.0F);
            sound.samples.push_back(sum / static_cast<float>(channels));
        }
    }
    sound.samples.resize(std::min(sound.samples.size(), limit));
    return sound;
}

void forEachFrame(MonoSound const& sound, int engineRateHz, int frameMs,
                  std::function<void(std::span<float const>)> const& take) {
    auto const size = static_cast<std::size_t>(frameSize(engineRateHz, frameMs));
    RateConverter converter(sound.rateHz, engineRateHz);
    std::vector<float> samples;
    converter.push(sound.samples, samples);
    converter.finish(samples);
    samples.resize((samples.size() + size - 1) / size * size);
    for (std::size_t at = 0; at < samples.size(); at += size)
        take(std::span(samples).subspan(at, size));
}

}  // namespace morva::cli
