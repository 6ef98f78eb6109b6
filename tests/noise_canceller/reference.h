// Noise cleaning of every generation (10: version NC_1.0.0) and voice activity in plain double
// precision, written from the formulas alone: no state is clever, nothing is fast. Tests compare
// the engine with it.
#pragma once

#include <algorithm>
#include <cmath>
#include <complex>
#include <deque>
#include <map>
#include <numbers>
#include <numeric>
#include <optional>
#include <string>
#include <valarray>
#include <vector>

#include "kernels/matrix.h"
#include "weights/weight.h"

namespace reference {

using MORVA::CONTAINERS::Matrix;
using MORVA::WEIGHTS::Weight;
using Values = std::valarray<double>;
using Spectrum = std::valarray<std::complex<double>>;
using History = std::vector<double>;
using Vector = std::vector<float>;
using Vectors = std::vector<Vector>;
using Matrices = std::vector<Matrix>;
constexpr double kPi = std::numbers::pi;

template <class Numbers>
Values valuesOf(Numbers const& numbers) {
    Values values(numbers.size());
    std::copy(numbers.begin(), numbers.end(), std::begin(values));
    return values;
}

inline Values joined(Values const& a, Values const& b) {
    Values all(a.size() + b.size());
    std::copy(std::begin(b), std::end(b), std::copy(std::begin(a), std::end(a), std::begin(all)));
    return all;
}

inline Values sigmoid(Values const& x) {
    return 1.0 / (1.0 + std::exp(-x));
}

inline double meanSquare(Values const& x) {
    return (x * x).sum() / static_cast<double>(x.size());
}

// Of the newest entries, or of all if they are fewer.
inline double meanOfLast(History const& all, std::size_t count) {
    auto const n = static_cast<long>(std::min(count, all.size()));
    return std::accumulate(all.end() - n, all.end(), 0.0) / static_cast<double>(n);
}

inline Values hamming(std::size_t n) {
    Values w(n);
    for (std::size_t i = 0; i < n; ++i) w[i] = static_cast<double>(i);
    return 0.54 - 0.46 * std::cos(2.0 * kPi / (static_cast<double>(n) - 1.0) * w);
}

inline Values affine(Values const& x, Matrix const& matrix, Vector const& bias) {
    Values y = valuesOf(bias);
    for (std::size_t r = 0; r < matrix.rows; ++r) {
        for (std::size_t c = 0; c < matrix.cols; ++c)
            y[c] += x[r] * matrix.data[r * matrix.cols + c];
    }
    return y;
}

// sum of x_n exp(-2 pi i k n / N) for all N bins.
inline Spectrum dft(Spectrum const& x) {
    std::size_t const n = x.size();
    if (n == 1) return x;
    static std::map<std::size_t, std::vector<std::complex<double>>> tables;
    auto& turns = tables[n];
    for (std::size_t i = turns.size(); i < n; ++i) {
        turns.push_back(
            std::polar(1.0, -2.0 * kPi * static_cast<double>(i) / static_cast<double>(n)));
    }
    std::size_t const parts = n % 2 == 0 ? 2 : n;  // halves while they last, then the plain sum
    Spectrum y(n);
    for (std::size_t p = 0; p < parts; ++p) {
        Spectrum const sub = dft(x[std::slice(p, n / parts, parts)]);
        for (std::size_t k = 0; k < n; ++k) y[k] += sub[k % sub.size()] * turns[p * k % n];
    }
    return y;
}

inline Spectrum dft(Values const& x) {
    Spectrum y(x.size());
    std::copy(std::begin(x), std::end(x), std::begin(y));
    return dft(y);
}

// What stands before the last layer of a network of a generation (7: voice activity).
inline Values hiddenLayers(Weight const& weight, int generation, Values& state,
                           Values const& features) {
    auto const product = [&](Values const& x, char const* matrix, char const* bias) {
        return affine(x, weight.getReference<Matrix>(matrix), weight.getReference<Vector>(bias));
    };
    auto const layer = [&](Values const& x, std::string const& branch, std::size_t i) -> Values {
        auto const bias = [&](std::string const& name) {
            return weight.getReference<Vectors>(name.c_str())[i];
        };
        auto const& matrices = weight.getReference<Matrices>(("Weight" + branch).c_str());
        Values y = affine(x, matrices[i], bias("Baes" + branch));
        if (generation != 6) return y;
        y -= y.sum() / static_cast<double>(y.size());
        return y / (std::sqrt(meanSquare(y)) + 1e-6) * valuesOf(bias("Gain" + branch + "Norm")) +
               valuesOf(bias("Bias" + branch + "Norm"));
    };
    Values x = joined(state, features);
    Values gate;
    if (generation >= 3) gate = sigmoid(product(x, "WeightGRU", "BaesGRU"));
    if (gate.size() == 1) gate = Values(gate[0], state.size());
    if (generation == 6) {
        x[std::slice(0, state.size(), 1)] *=
            sigmoid(product(x, "WeightGRU_reset", "BiasGRU_reset"));
    }
    std::size_t const count = weight.getReference<Vectors>("BaesNonLinear").size() - 1;
    for (std::size_t i = 0; i < count; ++i) {
        Values const rectified =
            layer(x, "NonLinear", i).apply([](double v) { return std::max(v, 0.0); });
        x = layer(x, "Linear", i) + rectified;
        if (i > 0 || generation < 3) continue;
        Values const fresh = generation == 6 ? Values(1.0 - gate) : gate;
        state = fresh * x + (1.0 - fresh) * state;
        if (generation == 6) x = state;
    }
    return x;
}

// The network of version NC_1.0.0, one group of bands after the other.
class BandNetwork {
public:
    explicit BandNetwork(Weight const& weight) : weight_(weight) {}

    // Masks of all bands, their shares of noise, the voice score.
    Values answers(Values const& features) {
        Values const x = (features - vector("MU")) / vector("SD");
        auto const& place = weight_.getReference<Matrix>("WeightPlace");
        states_.resize(weight_.getReference<Matrices>("WeightTimeIn").size(),
                       Groups(place.rows, Values(place.cols)));
        Groups seen;
        Groups y;
        for (std::size_t g = 0; g < place.rows; ++g) {
            seen.push_back(seenBy(g, x));
            Vector const row(&place.data[g * place.cols], &place.data[g * place.cols] + place.cols);
            y.push_back(rectified(product("Gather", seen[g]) + valuesOf(row)));
        }
        for (std::size_t block = 0; block < states_.size(); ++block) {
            if (weight_.values().contains("WeightGroupsIn")) runAcross(block, y);
            for (std::size_t g = 0; g < y.size(); ++g) {
                Values const x_g =
                    normed(y[g], entry("GainTimeNorm", block), entry("BiasTimeNorm", block));
                states_[block][g] = gated("Time", block, x_g, states_[block][g]);
                y[g] += states_[block][g];
            }
        }
        Values masks;
        Values noise;
        Values all;
        for (std::size_t g = 0; g < y.size(); ++g) {
            y[g] = normed(y[g], vector("GainNorm"), vector("BiasNorm"));
            Values const each =
                product("Output", rectified(product("Spread", joined(y[g], seen[g]))));
            std::size_t const half = each.size() / 2;
            masks = joined(masks, each[std::slice(0, half, 1)]);
            noise = joined(noise, each[std::slice(half, half, 1)]);
            all = joined(all, y[g]);
        }
        Values const voice = product("Score", 1, rectified(product("Score", 0, all)));
        return sigmoid(joined(joined(masks, noise), voice));
    }

private:
    using Groups = std::vector<Values>;

    Values vector(std::string const& name) const {
        return valuesOf(weight_.getReference<Vector>(name));
    }
    Values entry(std::string const& name, std::size_t i) const {
        return valuesOf(weight_.getReference<Vectors>(name)[i]);
    }
    Values product(std::string const& name, Values const& x) const {
        return affine(x, weight_.getReference<Matrix>("Weight" + name),
                      weight_.getReference<Vector>("Bias" + name));
    }
    Values product(std::string const& name, std::size_t i, Values const& x) const {
        return affine(x, weight_.getReference<Matrices>("Weight" + name)[i],
                      weight_.getReference<Vectors>("Bias" + name)[i]);
    }
    static Values rectified(Values const& x) {
        return x.apply([](double v) { return std::max(v, 0.0); });
    }
    static Values normed(Values x, Values const& gain, Values const& bias) {
        x -= x.sum() / static_cast<double>(x.size());
        return x / std::sqrt(meanSquare(x) + 1e-5) * gain + bias;
    }
    Values gated(std::string const& name, std::size_t i, Values const& x, Values const& h) const {
        Values const a = product(name + "In", i, x);
        Values const b = product(name + "State", i, h);
        auto const gate = [&](std::size_t g) { return std::slice(g * h.size(), h.size(), 1); };
        Values const z = sigmoid(Values(a[gate(1)]) + Values(b[gate(1)]));
        Values const r = sigmoid(Values(a[gate(0)]) + Values(b[gate(0)]));
        Values const n = std::tanh(Values(a[gate(2)]) + r * Values(b[gate(2)]));
        return (1.0 - z) * n + z * h;
    }
    Values seenBy(std::size_t group, Values const& x) const {
        int const bands = static_cast<int>(weight_.getReference<Vector>("BandWidths").size());
        int const own = weight_.getReference<int>("GroupBands");
        int const reach = weight_.getReference<int>("GroupReach");
        int const first = static_cast<int>(group) * own;
        History seen;
        for (int kind = 0; kind < static_cast<int>(x.size()); kind += bands) {
            for (int k = first - reach; k < first + own + reach; ++k)
                seen.push_back(k < 0 || k >= bands ? 0.0 : x[static_cast<std::size_t>(kind + k)]);
        }
        return valuesOf(seen);
    }
    void runAcross(std::size_t block, Groups& y) const {
        Groups both(y.size());
        for (std::size_t direction = 0; direction < 2; ++direction) {
            std::size_t const i = 2 * block + direction;
            Values h(weight_.getReference<Matrices>("WeightGroupsState")[i].rows);
            for (std::size_t step = 0; step < y.size(); ++step) {
                std::size_t const g = direction == 0 ? step : y.size() - 1 - step;
                Values const x =
                    normed(y[g], entry("GainGroupsNorm", block), entry("BiasGroupsNorm", block));
                h = gated("Groups", i, x, h);
                both[g] = joined(both[g], h);
            }
        }
        for (std::size_t g = 0; g < y.size(); ++g) y[g] += product("GroupsOut", block, both[g]);
    }

    Weight const& weight_;
    std::vector<Groups> states_;
};

// Tunable parameters by name, flags as 0 and 1.
using Tunables = std::map<std::string, double>;

class EnergyGate {
public:
    double next(double energy, std::size_t window, double threshold) {
        all_.push_back(energy);
        if (energy / 10.0 >= threshold) active_.push_back(energy);
        if (active_.empty()) return 1.0;
        double const active = meanOfLast(active_, window);
        double const low = active / 80.0;
        double const position = (meanOfLast(all_, 10) - low) / (active / 15.0 - low);
        return std::pow(std::clamp(position, 0.0, 1.0), 2);
    }

private:
    History all_ = History(10);
    History active_;
};

class MeanEnergy {
public:
    explicit MeanEnergy(double initial) : active_{initial} {}
    double next(double energy, std::size_t window, double threshold) {
        all_.push_back(energy);
        if (meanOfLast(all_, 10) >= threshold) active_.push_back(energy);
        return meanOfLast(active_, window);
    }

private:
    History all_ = History(10);
    History active_;
};

class SpeakerFix {
public:
    SpeakerFix(Tunables const& tunables, double frameMs)
        : t_(tunables), keep_(1.0 - frameMs / (2000.0 * at("UTTERANCE_LEN"))) {}

    double gainFor(double energy) {
        history_.push_back(energy);
        double const mean = meanOfLast(history_, length_);
        double const level = 10.0 * std::log10(reference_ / (1.0 + mean));
        double const start = at("CUT_START_DB");
        double const end = at("CUT_END_DB");
        double const gainDb = level < start ? 0.0 : (level - start) * -60.0 / (end - start);
        if (level < start) reference_ = keep_ * reference_ + (1.0 - keep_) * mean;
        bool const longer = level <= end && length_ < longest_;
        bool const shorter = level > end && static_cast<double>(length_) > at("RUN_MIN_LEN");
        if (at("VAR_WIND_MODE") != 0.0 && (longer || shorter)) length_ += longer ? 1 : -1UL;
        return std::pow(10.0, gainDb / 10.0);
    }

private:
    double at(std::string const& name) const { return t_.at("BACKGROUND_SPEAKER_FIX_" + name); }

    Tunables t_;
    double keep_;
    double reference_ = 1.0;
    std::size_t longest_ = static_cast<std::size_t>(at("RUN_FRAME_COUNT"));
    std::size_t length_ = longest_;
    History history_ = History(longest_, 1.0);
};

class Cleaner {
public:
    Cleaner(Weight const& weight, Tunables const& tunables, int generation, std::size_t sessionMs)
        : weight_(weight), t_(tunables), generation_(generation) {
        static std::map<std::size_t, std::map<std::size_t, std::size_t>> const delayMs = {
            {20, {{10, 10}, {20, 10}, {30, 10}, {40, 10}}},
            {30, {{10, 25}, {20, 25}, {30, 15}, {40, 25}}},
            {32, {{10, 31}, {20, 28}, {30, 30}, {40, 28}}}};
        std::size_t const modelMs = length_ * 1000 / rateHz_;
        input_.assign(hop_, 0.0);
        output_.assign(delayMs.at(modelMs).at(sessionMs) * rateHz_ / 1000, 0.0);

        for (std::size_t i = 0; i < length_; ++i) {
            double const part = static_cast<double>(i) / static_cast<double>(length_);
            synthesis_[i] = generation == 1
                                ? (1.0 - std::abs(2.0 * part - 1.0)) / analysis_[i]
                                : std::sin(kPi / 2.0 * std::pow(std::sin(kPi * part), 2));
        }
        if (generation > 1) analysis_ = synthesis_;
        if (generation >= 6 && on("ENABLE_BACKGROUND_SPEAKER_FIX"))
            speaker_.emplace(t_, static_cast<double>(modelMs));
        if (generation == 10) {
            network_.emplace(weight);
            std::size_t at = 0;
            for (float const width : weight.getReference<Vector>("BandWidths")) {
                groups_.emplace_back(at, static_cast<std::size_t>(width), 1);
                at += groups_.back().size();
            }
            powerBefore_.resize(groups_.size());
            return;
        }
        // The width doubles each time the read position reaches twice the start of the octave.
        std::size_t const bins = number("FiltrEnd") - begin_;
        std::size_t const depth =
            generation >= 4 ? static_cast<std::size_t>(t_.at("COMPRESS_RATE")) : 0;
        std::size_t const single = bins >> depth;
        for (std::size_t at = 0, width = 1, octave = single; at < bins; at += width) {
            if (at == single && depth > 0) width = 2;
            if (at == 2 * octave) width *= 2, octave = at;
            groups_.emplace_back(begin_ + at, width, 1);
        }
        frames_.assign(number("PreviewFrames"), Values(groups_.size()));
        logFrames_.assign(10, Values(groups_.size()));
        auto const& layers = weight.getReference<Matrices>("WeightNonLinear");
        std::size_t const features = layers.size() == 1 ? frames_.size() * groups_.size() : 0;
        if (generation >= 3) state_.resize(layers.back().rows - features);
    }

    Values clean(Values const& frame) {
        bool const silent = on("SKIP_FRAME") && std::abs(frame).max() == 0.0;
        input_.insert(input_.end(), std::begin(frame), std::end(frame));
        while (input_.size() >= length_) {
            Values const in(input_.data(), length_);
            Values const cleaned = step(in, silent);
            output_.resize(output_.size() + hop_);
            double* const sum = output_.data() + output_.size() - length_;
            for (std::size_t i = 0; i < length_; ++i) sum[i] += cleaned[i];
            double const removed = meanSquare(in[std::slice(0, hop_, 1)] - Values(sum, hop_));
            noisePower_ = 0.9 * noisePower_ + 0.1 * (network_ ? noise_ : removed);
            input_.erase(input_.begin(), input_.begin() + static_cast<long>(hop_));
        }
        Values const out(output_.data(), frame.size());
        output_.erase(output_.begin(), output_.begin() + static_cast<long>(frame.size()));
        return out;
    }
    // Level of what has been removed so far, dB.
    double noiseLevelDb() const { return 10.0 * std::log10(noisePower_ + 1e-6); }
    // Of generation 10.
    double voiceScore() const { return voice_; }

private:
    std::size_t number(char const* name) const {
        return static_cast<std::size_t>(weight_.getReference<int>(name));
    }
    bool on(char const* flag) const { return t_.at(flag) != 0.0; }

    // What brings the sound to the level of reference.
    double gainFor(Values const& in) {
        double gain = 1.0;
        if (generation_ >= 3 && on("ENABLE_RESCALE")) {
            double const energy =
                level_.next(meanSquare(in), rateHz_ * 3 / hop_, t_.at("RESCALE_REF_EN"));
            if (energy > 1e-6) gain = t_.at("RESCALE_REF_AMPL") / std::sqrt(energy);
        }
        return gain;
    }

    // The logarithms of the bands, with the level of the sound taken out.
    Values bandsOf(Values const& in, Spectrum const& spectrum) {
        double const gain = gainFor(in);
        Values bands(groups_.size());
        for (std::size_t g = 0; g < bands.size(); ++g) {
            Spectrum const group = spectrum[groups_[g]];
            for (auto const& bin : group) bands[g] += std::norm(bin * gain);
        }
        bands = std::log(bands + 1000.0);
        if (generation_ >= 3) return bands;
        logFrames_.pop_front();
        logFrames_.push_back(bands);
        for (auto const& frame : logFrames_) bands -= frame / 10.0;
        return bands;
    }

    Values network() {
        Values const mu = valuesOf(weight_.getReference<Vector>("MU"));
        Values const sd = valuesOf(weight_.getReference<Vector>("SD"));
        Values x;
        for (auto const& frame : frames_) x = joined(x, (frame - mu) / sd);
        return sigmoid(affine(hiddenLayers(weight_, generation_, state_, x),
                              weight_.getReference<Matrices>("WeightNonLinear").back(),
                              weight_.getReference<Vectors>("BaesNonLinear").back()));
    }

    // The masks of generation 10, which says what is noise, too.
    Values heard(Values const& in, Spectrum const& spectrum) {
        double const offset = 1000.0 / std::pow(gainFor(in), 2);
        std::size_t const bands = groups_.size();
        Values power(bands);
        Spectrum turned(bands);
        for (std::size_t g = 0; g < bands; ++g) {
            std::size_t const first = groups_[g].start();
            for (std::size_t k = first; k < first + groups_[g].size(); ++k) {
                power[g] += std::norm(spectrum[k]);
                turned[g] += spectrum[k] * std::conj(before_[k]) * (k % 2 == 0 ? 1.0 : -1.0);
            }
        }
        Values const scale = 1.0 / std::sqrt((power + offset) * (powerBefore_ + offset));
        Values features = std::log(power * (1000.0 / offset) + 1000.0);
        if (weight_.getReference<Vector>("MU").size() > bands) {
            Values re(bands);
            Values im(bands);
            for (std::size_t g = 0; g < bands; ++g) {
                re[g] = turned[g].real() * scale[g];
                im[g] = turned[g].imag() * scale[g];
            }
            features = joined(features, joined(re, im));
        }
        before_ = spectrum;
        powerBefore_ = power;
        Values const answers = network_->answers(features);
        auto const part = [&](std::size_t i) {
            return Values(answers[std::slice(i * bands, bands, 1)]);
        };
        noise_ = (part(1) * power).sum() * 4.0 / std::pow(static_cast<double>(length_), 2);
        voice_ = answers[2 * bands];
        return part(0);
    }

    void shapeMask(Values const& bands, double gateGain) {
        Values seen(mask_.size());
        for (std::size_t g = 0; g < groups_.size(); ++g) seen[groups_[g]] = bands[g];
        for (std::size_t k = 0; k < mask_.size(); ++k) {
            double m = seen[k];
            if (network_) {
                mask_[k] = m * gateGain;
                continue;
            }
            double const t = (m - 0.05) / 0.05;
            m = on("SMOOT_RM_MODIFY") ? m / (1.0 + std::exp(t)) + m * m / (1.0 + std::exp(-3.0 * t))
                                      : m * m;
            if (on("HIGH_FREQ_SMOOT") && k >= mask_.size() / 2) m *= m;
            m = (1.0 - t_.at("SMOOT_COEF")) * mask_[k] + t_.at("SMOOT_COEF") * m;
            double const threshold = t_.at("RM_THRESHOLD");
            if (on("ENABLE_RM_THRESHOLD") && m < threshold) m = m * m / threshold;
            mask_[k] = m * gateGain;
        }
    }

    // One model frame.
    Values step(Values const& in, bool silent) {
        Values const windowed = in * analysis_;
        double const gateGain = on("ENABLE_THRESH_CUT")
                                    ? gate_.next(meanSquare(windowed), rateHz_ * 4 / length_,
                                                 t_.at("THRESH_CUT_REF_EN"))
                                    : 1.0;
        Spectrum spectrum = dft(windowed);
        if (network_) {
            shapeMask(heard(in, spectrum), gateGain);
        } else {
            frames_.pop_front();
            frames_.push_back(bandsOf(in, spectrum));
            shapeMask(silent ? Values(1.0, groups_.size()) : network(), gateGain);
        }
        // The inverse as the forward transform of the conjugate, which a real result does not mind.
        for (std::size_t k = 0; k < length_; ++k)
            spectrum[k] = std::conj(spectrum[k]) * mask_[std::min(k, length_ - k)];
        spectrum = dft(spectrum);
        Values frame(length_);
        for (std::size_t i = 0; i < length_; ++i)
            frame[i] = spectrum[i].real() / static_cast<double>(length_);
        if (on("VOLUME_UP")) frame *= 1.0 + t_.at("VOLUME_UP_PERCENT") / 100.0;
        if (speaker_) frame *= speaker_->gainFor((frame * frame).sum() / windowEnergy());
        frame *= synthesis_;
        double const limit = t_.at("CLIP_FIX_POINT");
        if ((on("VOLUME_UP") || on("ENABLE_CLIP_FIX")) && frame.max() > limit)
            frame *= limit / frame.max();
        return frame;
    }
    double windowEnergy() const { return (synthesis_ * synthesis_).sum(); }

    Weight const& weight_;
    Tunables t_;
    int generation_;
    std::size_t rateHz_ = number("SampleRate");
    std::size_t length_ = number("FrameLength");
    std::size_t hop_ = length_ / 2;
    std::size_t begin_ = generation_ == 10 ? 0 : number("FiltrBegin");
    std::vector<std::slice> groups_;  // the bins of every band
    Values analysis_ = hamming(length_);
    Values synthesis_ = Values(length_);
    EnergyGate gate_;
    MeanEnergy level_{std::pow(t_.at("RESCALE_REF_AMPL"), 2)};
    std::optional<SpeakerFix> speaker_;
    std::deque<Values> logFrames_, frames_;
    Values state_;
    Values mask_ = Values(hop_ + 1);
    History input_, output_;
    double noisePower_ = 0.0;

    std::optional<BandNetwork> network_;
    Spectrum before_ = Spectrum(length_);
    Values powerBefore_;
    double noise_ = 0.0;
    double voice_ = 0.0;
};

class VoiceActivity {
public:
    VoiceActivity(Weight const& weight, bool watchdog) : weight_(weight), watchdog_(watchdog) {
        context_.assign(5, standardised(Values(weight.getReference<Vector>("MU").size())));
    }

    double score(Values const& frame) {
        double const energy = meanSquare(frame);
        double const alpha = std::pow(10.0, -0.02);
        if (energy >= 10000.0)
            level_ += (energy > 2.0 * level_ ? alpha : 1.0 - alpha) * (energy - level_);
        Values const all = joined(samples_, frame * 2000.0 / (std::sqrt(level_) + 1e-7));
        samples_ = all[std::slice(frame.size(), samples_.size(), 1)];
        context_.pop_front();
        context_.push_back(
            standardised(std::log(pooled(dft(samples_ * hamming(samples_.size()))) + 1.0)));
        Values x;
        for (auto const& bands : context_) x = joined(x, bands);
        double const y = affine(hiddenLayers(weight_, 7, state_, x),
                                weight_.getReference<Matrices>("WeightLinear").back(),
                                weight_.getReference<Vectors>("BaesLinear").back())[0];
        if (watchdog_) watch(y);
        return calibrated(y);
    }
    int resets = 0;

private:
    Values standardised(Values const& x) const {
        return (x - valuesOf(weight_.getReference<Vector>("MU"))) /
               std::sqrt(valuesOf(weight_.getReference<Vector>("SD")) + 1e-7);
    }

    // The lowest quarter as it is, then pairs up to the half, fours above.
    static Values pooled(Spectrum const& spectrum) {
        std::size_t const quarter = spectrum.size() / 8;
        History bands;
        for (std::size_t i = 0, width = 1; i <= spectrum.size() / 2; i += width) {
            if (i == quarter + 1) width = 2;
            if (i == 2 * quarter + 1) width = 4;
            bands.push_back(0.0);
            for (std::size_t k = i; k < i + width; ++k)
                bands.back() += std::norm(spectrum[k]) / static_cast<double>(width);
        }
        return valuesOf(bands);
    }

    void watch(double y) {
        low_.push_back(sigmoid({y})[0] < 0.75 ? 1.0 : 0.0);
        if (++sinceReset_ < 300 || meanOfLast(low_, 200) <= 0.95) return;
        state_ = 0.0;
        sinceReset_ = 0;
        ++resets;
    }

    double calibrated(double y) const {
        auto const range = weight_.values().find<Vector>("Test_MINMAX");
        if (!range) return y;
        double const b = weight_.getReference<Vector>("Test_BestF1")[0];
        double const s = y >= b ? (y - b) * 0.5 / ((*range)[1] - b) + 0.5
                                : (y - (*range)[0]) * 0.5 / (b - (*range)[0]);
        return std::clamp(s, 0.00001, 0.99999);
    }

    Weight const& weight_;
    bool watchdog_;
    double level_ = 4000000.0;
    Values samples_ = Values(static_cast<std::size_t>(weight_.getReference<int>("FrameLength")));
    std::deque<Values> context_;
    Values state_ = Values(weight_.getReference<Matrices>("WeightNonLinear").back().rows);
    History low_;
    int sinceReset_ = 0;
};

}  // namespace reference
