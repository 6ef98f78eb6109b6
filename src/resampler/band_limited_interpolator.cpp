#include "resampler/band_limited_interpolator.h"

#include <algorithm>

#include "kernels/vector_math.h"

namespace MORVA::UTILS {
namespace {

constexpr std::size_t kUsualCapacity = 4096;
constexpr std::size_t kVectorLanes = 8;
constexpr double kNoDrift = 1e-15;

}  // namespace

BandLimitedInterpolator::BandLimitedInterpolator(std::size_t inRate, std::size_t outRate)
    : filter_(InterpolationFilter::forRates(inRate, outRate)),
      phaseStep_(static_cast<std::size_t>(filter_->inStep() % filter_->outStep())),
      step_(1.0 / (static_cast<double>(outRate) / static_cast<double>(inRate))),
      margin_(
          InterpolationFilter::margin(static_cast<double>(outRate) / static_cast<double>(inRate))),
      capacity_(std::max(2 * margin_ + 10, kUsualCapacity)),
      window_(capacity_ + kVectorLanes, 0.0f) {  // rows are padded to whole vectors
    reset();
}

void BandLimitedInterpolator::reset() {
    std::fill(window_.begin(), window_.end(), 0.0f);
    filled_ = margin_;
    clock_ = static_cast<double>(margin_);
    end_ = clock_;
    phase_ = 0;
}

int BandLimitedInterpolator::process(float const* in, int inCount, int& used, float* out,
                                     int room) {
    std::size_t consumed = 0;
    int produced = 0;
    while (true) {
        double const start = clock_;
        bool const resumed = clock_ < end_;  // the last call ran out of room
        if (!resumed) {
            consumed += take(in + consumed, static_cast<std::size_t>(inCount) - consumed);
            if (filled_ <= 2 * margin_) break;
            end_ = start + static_cast<double>(filled_ - 2 * margin_);
        }
        while (clock_ < end_ && produced < room) out[produced++] = interpolate();
        if (clock_ < end_) break;
        forget(static_cast<double>(filled_ - 2 * margin_));
    }
    used = static_cast<int>(consumed);
    return produced;
}

std::size_t BandLimitedInterpolator::take(float const* in, std::size_t count) {
    std::size_t const taken = std::min(count, capacity_ - filled_);
    std::copy_n(in, taken, window_.begin() + static_cast<std::ptrdiff_t>(filled_));
    filled_ += taken;
    return taken;
}

// Sets the clock back by what has passed and lets the input go that lies before its margin.
void BandLimitedInterpolator::forget(double passed) {
    clock_ -= passed;
    auto const creep = static_cast<std::ptrdiff_t>(clock_) - static_cast<std::ptrdiff_t>(margin_);
    clock_ -= static_cast<double>(creep);
    std::ptrdiff_t const gone = static_cast<std::ptrdiff_t>(passed) + creep;
    std::copy(window_.begin() + gone, window_.begin() + static_cast<std::ptrdiff_t>(filled_),
              window_.begin());
    filled_ -= static_cast<std::size_t>(gone);
    end_ = clock_;
}

// One output sample; moves the clock on.
float BandLimitedInterpolator::interpolate() {
    double const fraction = filter_->fraction(phase_);
    double const next = clock_ - fraction + 0.5;  // never below zero: cut off, the nearest
    auto const base = static_cast<std::ptrdiff_t>(next);
    double const drift = (clock_ - static_cast<double>(base)) - fraction;
    auto const side = drift > kNoDrift    ? InterpolationFilter::Drift::ahead
                      : drift < -kNoDrift ? InterpolationFilter::Drift::behind
                                          : InterpolationFilter::Drift::none;
    float const* const x = window_.data() + base + filter_->firstTap();
    float const value = dotProduct(x, filter_->row(phase_, side), filter_->taps());
    clock_ += step_;
    phase_ += phaseStep_;
    if (phase_ >= filter_->outStep()) phase_ -= filter_->outStep();
    return value;
}

}  // namespace MORVA::UTILS
