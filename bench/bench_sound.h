// Sounds that benchmarks feed the engine: speech-like, silent, denormal, clipped. Made from a seed.
#pragma once

#include <cmath>
#include <cstddef>
#include <random>
#include <string>
#include <vector>

namespace morva_bench {

enum class Sound { speech, silence, denormal, clipped };

// `seconds` of mono float samples in -1..1 at `rate`.
inline std::vector<float> makeSound(Sound kind, int rate, double seconds) {
    std::mt19937 random(7);
    std::normal_distribution<float> noise(0.0f, 1.0f);
    std::vector<float> samples(static_cast<std::size_t>(rate * seconds));
    constexpr double kTau = 6.283185307179586;
    double phase = 0.0;
    for (std::size_t i = 0; i < samples.size(); ++i) {
        double const t = static_cast<double>(i) / rate;
        // A voiced source with gliding pitch and syllables of 250 ms, over noise 20 dB below.
        phase += (120.0 + 30.0 * std::sin(kTau * 0.7 * t)) / rate;
        double voice = 0.0;
        for (int harmonic = 1; harmonic <= 20; ++harmonic) {
            voice += std::sin(kTau * phase * harmonic) / harmonic;
        }
        double const syllable = std::max(0.0, std::sin(kTau * 2.0 * t));
        auto const speech = static_cast<float>(0.1 * syllable * voice) + 0.01f * noise(random);
        switch (kind) {
            case Sound::speech:
                samples[i] = speech;
                break;
            case Sound::silence:
                samples[i] = 0.0f;
                break;
            case Sound::denormal:
                samples[i] = speech * 1e-39f;
                break;
            case Sound::clipped:
                samples[i] = speech > 0.0f ? 1.0f : -1.0f;
                break;
        }
    }
    return samples;
}

}  // namespace morva_bench
