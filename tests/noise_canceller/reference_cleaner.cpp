#include "reference_cleaner.h"

#include <algorithm>
#include <cmath>
#include <complex>
#include <numbers>
#include <numeric>
#include <utility>

namespace reference {
namespace {

constexpr double kPi = std::numbers::pi;

using MORVA::CONTAINERS::Matrix;
using Matrices = std::vector<Matrix>;
using Vector = std::vector<float>;
using Vectors = std::vector<Vector>;

double energyOf(Values const& frame) {
    return std::inner_product(frame.begin(), frame.end(), frame.begin(), 0.0) /
           static_cast<double>(frame.size());
}

// Mean of the newest entries; missing ones count as zero.
double meanOfLast(Values const& all, std::size_t count, double over) {
    auto const first = all.size() > count ? all.end() - static_cast<long>(count) : all.begin();
    return std::accumulate(first, all.end(), 0.0) / over;
}

Values vorbis(std::size_t n) {
    Values w(n);
    for (std::size_t i = 0; i < n; ++i) {
        w[i] =
            std::sin(kPi / 2.0 *
                     std::pow(std::sin(kPi * static_cast<double>(i) / static_cast<double>(n)), 2));
    }
    return w;
}

Values normalised(Values x, Vector const& gain, Vector const& bias) {
    double const n = static_cast<double>(x.size());
    double const mean = std::accumulate(x.begin(), x.end(), 0.0) / n;
    for (double& v : x) v -= mean;
    double const rms = std::sqrt(energyOf(x)) + 1e-6;
    for (std::size_t i = 0; i < x.size(); ++i) x[i] = x[i] / rms * gain[i] + bias[i];
    return x;
}

Values joined(Values const& a, Values const& b) {
    Values all = a;
    all.insert(all.end(), b.begin(), b.end());
    return all;
}

Values sigmoid(Values x) {
    for (double& v : x) v = reference::sigmoid(v);
    return x;
}

}  // namespace

double sigmoid(double t) {
    return 1.0 / (1.0 + std::exp(-t));
}

Values affine(Values const& x, Matrix const& matrix, Vector const& bias) {
    Values y(bias.begin(), bias.end());
    for (std::size_t r = 0; r < matrix.rows; ++r) {
        for (std::size_t c = 0; c < matrix.cols; ++c)
            y[c] += x[r] * matrix.data[r * matrix.cols + c];
    }
    return y;
}

Spectrum dft(Spectrum const& x) {
    std::size_t const n = x.size();
    static std::map<std::size_t, Spectrum> tables;
    auto& turns = tables[n];
    for (std::size_t i = turns.size(); i < n; ++i) {
        turns.push_back(
            std::polar(1.0, -2.0 * kPi * static_cast<double>(i) / static_cast<double>(n)));
    }
    std::size_t const parts = n % 2 == 0 ? 2 : n;  // halves while they last, then the plain sum
    std::vector<Spectrum> sub(parts);
    for (std::size_t i = 0; i < n; ++i) sub[i % parts].push_back(x[i]);
    if (n > 1) {
        for (auto& part : sub) part = dft(part);
    }
    Spectrum y(n);
    for (std::size_t k = 0; k < n; ++k) {
        for (std::size_t p = 0; p < parts; ++p)
            y[k] += sub[p][k % sub[p].size()] * turns[p * k % n];
    }
    return y;
}

std::map<std::string, Tunables::Value> Tunables::byName(int generation) const {
    std::map<std::string, Value> values = {
        {"SMOOT_COEF", smootCoef},
        {"SMOOT_RM_MODIFY", smootRmModify},
        {"HIGH_FREQ_SMOOT", highFreqSmoot},
        {"ENABLE_CLIP_FIX", clipFix},
        {"CLIP_FIX_POINT", clipPoint},
        {"SKIP_FRAME", skipFrame},
        {"VOLUME_UP", volumeUp},
        {"VOLUME_UP_PERCENT", volumePercent},
        {"ENABLE_THRESH_CUT", threshCut},
        {"THRESH_CUT_REF_EN", threshRef},
        {"ENABLE_RM_THRESHOLD", useRmThreshold},
        {"RM_THRESHOLD", rmThreshold},
        {"ENABLE_RESCALE", rescale},
        {"RESCALE_REF_AMPL", rescaleAmpl},
        {"RESCALE_REF_EN", rescaleEnergy},
        {"COMPRESS_RATE", compressRate},
    };
    if (generation == 6) {
        values.merge(std::map<std::string, Value>{
            {"ENABLE_BACKGROUND_SPEAKER_FIX", speakerFix},
            {"BACKGROUND_SPEAKER_FIX_CUT_START_DB", cutStart},
            {"BACKGROUND_SPEAKER_FIX_CUT_END_DB", cutEnd},
            {"BACKGROUND_SPEAKER_FIX_RUN_FRAME_COUNT", runFrames},
            {"BACKGROUND_SPEAKER_FIX_RUN_MIN_LEN", runMinimum},
            {"BACKGROUND_SPEAKER_FIX_UTTERANCE_LEN", utterance},
            {"BACKGROUND_SPEAKER_FIX_VAR_WIND_MODE", variableWindow},
        });
    }
    return values;
}

double EnergyGate::next(Values const& frame) {
    double const energy = energyOf(frame);
    all_.push_back(energy);
    if (energy / 10.0 >= threshold_) active_.push_back(energy);
    if (active_.empty()) return 1.0;
    auto const count = static_cast<double>(std::min(active_.size(), window_));
    double const active = meanOfLast(active_, window_, count);
    double const recent = meanOfLast(all_, 10, 10.0);
    double const position = (recent - active / 80.0) / (active / 15.0 - active / 80.0);
    return std::pow(std::clamp(position, 0.0, 1.0), 2);
}

double MeanEnergy::next(Values const& frame) {
    all_.push_back(energyOf(frame));
    if (meanOfLast(all_, 10, 10.0) >= threshold_) active_.push_back(all_.back());
    return meanOfLast(active_, window_, static_cast<double>(std::min(active_.size(), window_)));
}

SpeakerFix::SpeakerFix(Tunables const& tunables, double frameMs, double windowEnergy)
    : t_(tunables),
      keep_(1.0 - frameMs / (2000.0 * tunables.utterance)),
      windowEnergy_(windowEnergy),
      longest_(static_cast<std::size_t>(tunables.runFrames)),
      length_(longest_),
      history_(longest_, 1.0) {}

double SpeakerFix::gainFor(Values const& frame) {
    history_.push_back(energyOf(frame) * static_cast<double>(frame.size()) / windowEnergy_);
    double const mean = meanOfLast(history_, length_, static_cast<double>(length_));
    double const level = 10.0 * std::log10(reference_ / (1.0 + mean));
    double gainDb = 0.0;
    if (level >= t_.cutStart) {
        gainDb = (level - t_.cutStart) * -60.0 / (t_.cutEnd - t_.cutStart);
    } else {
        reference_ = keep_ * reference_ + (1.0 - keep_) * mean;
    }
    if (t_.variableWindow) {
        if (level > t_.cutEnd && length_ > static_cast<std::size_t>(t_.runMinimum)) {
            --length_;
        } else if (level <= t_.cutEnd && length_ < longest_) {
            ++length_;
        }
    }
    return std::pow(10.0, gainDb / 10.0);
}

Model::Model(MORVA::WEIGHTS::Weight const& weight, Tunables const& tunables, int generation)
    : weight_(weight), t_(tunables), generation_(generation) {
    auto const number = [&](char const* name) {
        return static_cast<std::size_t>(weight.getReference<int>(name));
    };
    rateHz = number("SampleRate");
    hop = number("Step");
    frameLength = number("FrameLength");
    begin_ = number("FiltrBegin");
    end_ = number("FiltrEnd");
    context_ = number("PreviewFrames");
    bins_ = number("CoefficientNumber");

    // The width doubles each time the read position reaches twice the start of the octave.
    std::size_t const bins = end_ - begin_;
    std::size_t const depth = generation >= 4 ? static_cast<std::size_t>(t_.compressRate) : 0;
    std::size_t const single = bins >> depth;
    for (std::size_t at = 0, width = 1, octave = single; at < bins; at += width) {
        if (at == single && depth > 0) width = 2;
        if (at == 2 * octave) width *= 2, octave = at;
        groups_.push_back({at, width});
    }

    analysis_ = synthesis_ = vorbis(frameLength);
    if (generation == 1) {
        auto const n = static_cast<double>(frameLength);
        for (std::size_t i = 0; i < frameLength; ++i) {
            auto const t = static_cast<double>(i);
            analysis_[i] = 0.54 - 0.46 * std::cos(2.0 * kPi * t / (n - 1.0));
            synthesis_[i] = (1.0 - std::abs(2.0 * t / n - 1.0)) / analysis_[i];
        }
    }
    if (t_.volumeUp) t_.clipFix = true;
    if (t_.threshCut) {
        gate_ = std::make_unique<EnergyGate>(rateHz * 4 / frameLength, t_.threshRef);
    }
    if (generation >= 3 && t_.rescale) {
        level_ = std::make_unique<MeanEnergy>(rateHz * 3 / hop, t_.rescaleEnergy,
                                              t_.rescaleAmpl * t_.rescaleAmpl);
    }
    if (generation == 6 && t_.speakerFix) {
        double const energy =
            std::inner_product(synthesis_.begin(), synthesis_.end(), synthesis_.begin(), 0.0);
        speaker_ = std::make_unique<SpeakerFix>(
            t_, static_cast<double>(frameLength * 1000 / rateHz), energy);
    }
    frames_.assign(context_, Values(groups_.size()));
    logFrames_.assign(10, Values(groups_.size()));
    mask_.assign(bins_, 0.0);
    auto const& layers = weight.getReference<Matrices>("WeightNonLinear");
    std::size_t state = 0;
    if (generation >= 3) state = layers.back().rows;
    if (generation >= 3 && layers.size() == 1) state -= context_ * groups_.size();
    state_.assign(state, 0.0);
}

Values Model::features(Values const& in) {
    Values windowed(in);
    for (std::size_t i = 0; i < in.size(); ++i) windowed[i] *= analysis_[i];
    if (gate_) gateGain_ = gate_->next(windowed);
    spectrum_ = dft(Spectrum(windowed.begin(), windowed.end()));

    double gain = 1.0;
    if (level_) {
        double const energy = level_->next(in);
        if (energy > 1e-6) gain = t_.rescaleAmpl / std::sqrt(energy);
    }
    Values bands;
    for (auto const& group : groups_) {
        double sum = 0.0;
        for (std::size_t k = begin_ + group.begin; k < begin_ + group.begin + group.width; ++k) {
            sum += std::norm(spectrum_[k]) * gain * gain;
        }
        bands.push_back(std::log(sum + 1000.0));
    }
    if (generation_ <= 2) {
        logFrames_.pop_front();
        logFrames_.push_back(bands);
        Values mean(bands.size());
        for (auto const& frame : logFrames_) {
            for (std::size_t k = 0; k < mean.size(); ++k) mean[k] += frame[k] / 10.0;
        }
        for (std::size_t k = 0; k < mean.size(); ++k) bands[k] -= mean[k];
    }
    frames_.pop_front();
    frames_.push_back(bands);

    auto const& mu = weight_.getReference<Vector>("MU");
    auto const& sd = weight_.getReference<Vector>("SD");
    Values x;
    for (auto const& frame : frames_) x = joined(x, frame);
    for (std::size_t i = 0; i < x.size(); ++i)
        x[i] = (x[i] - mu[i % mu.size()]) / sd[i % sd.size()];
    return x;
}

Values Model::hiddenLayer(std::size_t layer, Values const& x) const {
    auto a = affine(x, weight_.getReference<Matrices>("WeightNonLinear")[layer],
                    weight_.getReference<Vectors>("BaesNonLinear")[layer]);
    auto b = affine(x, weight_.getReference<Matrices>("WeightLinear")[layer],
                    weight_.getReference<Vectors>("BaesLinear")[layer]);
    if (generation_ == 6) {
        auto const norm = [&](char const* name) -> Vector const& {
            return weight_.getReference<Vectors>(name)[layer];
        };
        a = normalised(a, norm("GainNonLinearNorm"), norm("BiasNonLinearNorm"));
        b = normalised(b, norm("GainLinearNorm"), norm("BiasLinearNorm"));
    }
    for (std::size_t i = 0; i < a.size(); ++i) b[i] += std::max(a[i], 0.0);
    return b;
}

Values Model::network(Values features) {
    Values x = joined(state_, features);
    Values gate;
    if (generation_ >= 3) {
        gate = sigmoid(affine(x, weight_.getReference<Matrix>("WeightGRU"),
                              weight_.getReference<Vector>("BaesGRU")));
    }
    if (generation_ == 6) {
        auto const reset = sigmoid(affine(x, weight_.getReference<Matrix>("WeightGRU_reset"),
                                          weight_.getReference<Vector>("BiasGRU_reset")));
        for (std::size_t i = 0; i < state_.size(); ++i) x[i] *= reset[i];
    }
    auto const& layers = weight_.getReference<Matrices>("WeightNonLinear");
    for (std::size_t layer = 0; layer + 1 < layers.size(); ++layer) {
        x = hiddenLayer(layer, x);
        if (layer > 0) continue;
        for (std::size_t i = 0; i < state_.size(); ++i) {
            double const z = gate[gate.size() == 1 ? 0 : i];
            state_[i] = generation_ == 6 ? z * state_[i] + (1.0 - z) * x[i]
                                         : z * x[i] + (1.0 - z) * state_[i];
        }
        if (generation_ == 6) x = state_;
    }
    return sigmoid(affine(x, layers.back(), weight_.getReference<Vectors>("BaesNonLinear").back()));
}

Values Model::shapedMask(Values const& bands) {
    Values mask(bins_);
    for (std::size_t g = 0; g < groups_.size(); ++g) {
        for (std::size_t i = 0; i < groups_[g].width; ++i)
            mask[begin_ + groups_[g].begin + i] = bands[g];
    }
    for (std::size_t k = 0; k < bins_; ++k) {
        double& m = mask[k];
        double const t = (m - 0.05) / 0.05;
        m = t_.smootRmModify ? m / (1.0 + std::exp(t)) + m * m / (1.0 + std::exp(-3.0 * t)) : m * m;
        if (t_.highFreqSmoot && k >= bins_ / 2) m *= m;
        m = (1.0 - t_.smootCoef) * mask_[k] + t_.smootCoef * m;
        if (t_.useRmThreshold && m < t_.rmThreshold) m = m * m / t_.rmThreshold;
        m *= gateGain_;
    }
    return mask_ = mask;
}

Values Model::step(Values const& in, bool silent) {
    auto const x = features(in);
    auto const mask = shapedMask(silent ? Values(groups_.size(), 1.0) : network(x));
    // The inverse as the forward transform of the conjugate, which a real result does not mind.
    for (std::size_t k = 0; k < frameLength; ++k) {
        spectrum_[k] = std::conj(spectrum_[k]) * mask[std::min(k, frameLength - k)];
    }
    Values frame;
    for (auto const& v : dft(spectrum_))
        frame.push_back(v.real() / static_cast<double>(frameLength));
    if (t_.volumeUp) {
        for (double& v : frame) v *= 1.0 + t_.volumePercent / 100.0;
    }
    double const gain = speaker_ ? speaker_->gainFor(frame) : 1.0;
    for (std::size_t i = 0; i < frame.size(); ++i) frame[i] *= gain * synthesis_[i];
    double const peak = *std::max_element(frame.begin(), frame.end());
    if (t_.clipFix && peak > t_.clipPoint) {
        for (double& v : frame) v *= t_.clipPoint / peak;
    }
    return frame;
}

Cleaner::Cleaner(Model model, std::size_t modelMs, std::size_t sessionMs)
    : model_(std::move(model)) {
    static std::map<std::pair<std::size_t, std::size_t>, std::size_t> const delayMs = {
        {{20, 10}, 10}, {{20, 20}, 10}, {{20, 30}, 10}, {{20, 40}, 10},
        {{30, 10}, 25}, {{30, 20}, 25}, {{30, 30}, 15}, {{30, 40}, 25},
        {{32, 10}, 31}, {{32, 20}, 28}, {{32, 30}, 30}, {{32, 40}, 28}};
    input_.assign(model_.hop, 0.0);
    output_.assign(delayMs.at({modelMs, sessionMs}) * model_.rateHz / 1000, 0.0);
}

Values Cleaner::clean(Values const& frame) {
    bool const silent = model_.skipsSilence() &&
                        std::all_of(frame.begin(), frame.end(), [](double v) { return v == 0.0; });
    input_.insert(input_.end(), frame.begin(), frame.end());
    std::size_t const hop = model_.hop;
    while (input_.size() >= 2 * hop) {
        auto const cleaned = model_.step(
            Values(input_.begin(), input_.begin() + static_cast<long>(2 * hop)), silent);
        output_.insert(output_.end(), hop, 0.0);
        std::size_t const first = output_.size() - 2 * hop;
        double removed = 0.0;
        for (std::size_t i = 0; i < 2 * hop; ++i) {
            output_[first + i] += cleaned[i];
            if (i < hop) removed += std::pow(input_[i] - output_[first + i], 2);
        }
        noisePower_ = 0.9 * noisePower_ + 0.1 * removed / static_cast<double>(hop);
        input_.erase(input_.begin(), input_.begin() + static_cast<long>(hop));
    }
    auto const end = output_.begin() + static_cast<long>(frame.size());
    Values const out(output_.begin(), end);
    output_.erase(output_.begin(), end);
    return out;
}

double Cleaner::noiseLevelDb() const {
    return 10.0 * std::log10(noisePower_ + 1e-6);
}

}  // namespace reference
