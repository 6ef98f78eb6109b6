// A plain double-precision noise cleaner of every generation, written from the formulas alone: no
// state is clever, nothing is fast. Tests compare the engine with it.
#pragma once

#include <complex>
#include <cstddef>
#include <deque>
#include <map>
#include <memory>
#include <string>
#include <variant>
#include <vector>

#include "kernels/matrix.h"
#include "weights/weight.h"

namespace reference {

using Values = std::vector<double>;
using Spectrum = std::vector<std::complex<double>>;

// The tunable parameters with their defaults.
struct Tunables {
    double smootCoef = 1.0;
    bool smootRmModify = false;
    bool highFreqSmoot = false;
    bool clipFix = false;
    int clipPoint = 25000;
    bool skipFrame = false;
    bool volumeUp = false;
    double volumePercent = 0.0;
    bool threshCut = false;
    int threshRef = 100;
    bool useRmThreshold = false;
    double rmThreshold = 0.5;
    bool rescale = true;
    double rescaleAmpl = 2000.0;
    double rescaleEnergy = 100.0;
    int compressRate = 2;
    bool speakerFix = false;
    double cutStart = 10.0;
    double cutEnd = 15.0;
    double runFrames = 40.0;
    int runMinimum = 2;
    double utterance = 2.0;
    bool variableWindow = true;

    using Value = std::variant<bool, int, double>;
    // By name; the last seven belong to generation 6 alone.
    std::map<std::string, Value> byName(int generation) const;
};

// The running statistics, with all of their history kept.
class EnergyGate {
public:
    EnergyGate(std::size_t longWindow, double threshold)
        : window_(longWindow), threshold_(threshold) {}
    double next(Values const& frame);

private:
    std::size_t window_;
    double threshold_;
    Values all_;
    Values active_;
};

class MeanEnergy {
public:
    MeanEnergy(std::size_t longWindow, double threshold, double initial)
        : window_(longWindow), threshold_(threshold), active_{initial} {}
    double next(Values const& frame);

private:
    std::size_t window_;
    double threshold_;
    Values all_;
    Values active_;
};

class SpeakerFix {
public:
    SpeakerFix(Tunables const& tunables, double frameMs, double windowEnergy);
    double gainFor(Values const& frame);

private:
    Tunables t_;
    double keep_;
    double windowEnergy_;
    double reference_ = 1.0;
    std::size_t longest_;
    std::size_t length_;
    Values history_;
};

class Model {
public:
    Model(MORVA::WEIGHTS::Weight const& weight, Tunables const& tunables, int generation);

    std::size_t rateHz, hop, frameLength;
    bool skipsSilence() const { return t_.skipFrame; }
    // One model frame of frameLength samples.
    Values step(Values const& in, bool silent);

private:
    struct Group {
        std::size_t begin;
        std::size_t width;
    };
    Values features(Values const& in);
    Values network(Values x);
    Values hiddenLayer(std::size_t layer, Values const& x) const;
    Values shapedMask(Values const& bands);

    MORVA::WEIGHTS::Weight const& weight_;
    Tunables t_;
    int generation_;
    std::size_t begin_, end_, context_, bins_;
    std::vector<Group> groups_;
    Values analysis_, synthesis_;
    Spectrum spectrum_;
    double gateGain_ = 1.0;
    std::unique_ptr<EnergyGate> gate_;
    std::unique_ptr<MeanEnergy> level_;
    std::unique_ptr<SpeakerFix> speaker_;
    std::deque<Values> logFrames_;  // of generations 1 and 2
    std::deque<Values> frames_;
    Values state_;
    Values mask_;
};

// The pipeline around a model: session frames in, session frames out.
class Cleaner {
public:
    Cleaner(Model model, std::size_t modelMs, std::size_t sessionMs);

    Values clean(Values const& frame);
    // Level of what has been removed so far, dB.
    double noiseLevelDb() const;

private:
    Model model_;
    std::deque<double> input_;
    std::deque<double> output_;
    double noisePower_ = 0.0;
};

// sum of x_n exp(-2 pi i k n / N) for all N bins.
Spectrum dft(Spectrum const& x);
Values affine(Values const& x, MORVA::CONTAINERS::Matrix const& matrix,
              std::vector<float> const& bias);
double sigmoid(double t);

}  // namespace reference
