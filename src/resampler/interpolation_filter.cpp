#include "resampler/interpolation_filter.h"

#include <algorithm>
#include <cmath>
#include <map>
#include <memory>
#include <mutex>
#include <numbers>
#include <numeric>
#include <utility>

#include "utils/exception.h"

namespace MORVA::UTILS {
namespace {

constexpr std::int64_t kGridPoints = 4096;  // per zero crossing
constexpr std::int64_t kCrossings = 17;     // to each side
constexpr std::int64_t kWing = kGridPoints * kCrossings;
constexpr double kCutoff = 0.9;
constexpr double kKaiserBeta = 6.0;
constexpr std::size_t kVectorLanes = 8;
constexpr std::size_t kMaxCoefficients = std::size_t{1} << 22;  // 16 MiB

// The zeroth modified Bessel function, by its power series.
double besselI0(double x) {
    double sum = 1.0;
    double term = 1.0;
    for (int n = 1; term > 1e-21 * sum; ++n) {
        double const half = x / (2.0 * n);
        term *= half * half;
        sum += term;
    }
    return sum;
}

// One wing of the kernel on the grid.
std::vector<float> makeKernel() {
    std::vector<float> kernel(static_cast<std::size_t>(kWing));
    double const atCentre = besselI0(kKaiserBeta);
    for (std::int64_t i = 0; i < kWing; ++i) {
        double const angle =
            std::numbers::pi * kCutoff * static_cast<double>(i) / static_cast<double>(kGridPoints);
        double const sinc = i == 0 ? 1.0 : std::sin(angle) / angle;
        double const edge = static_cast<double>(i) / static_cast<double>(kWing - 1);
        double const window = besselI0(kKaiserBeta * std::sqrt(1.0 - edge * edge)) / atCentre;
        kernel[static_cast<std::size_t>(i)] = static_cast<float>(kCutoff * sinc * window);
    }
    return kernel;
}

// Threads may still open sessions while the process exits, so nothing here is destroyed then.
template <class T>
T& keepForEver(T value) {
    return *std::make_unique<T>(std::move(value)).release();
}

// The grid point of a tap; the right wing ends one point earlier than the left one.
float coefficient(std::int64_t point, bool right) {
    static auto const& kernel = keepForEver(makeKernel());
    std::int64_t const end = right ? kWing - 1 : kWing;
    return point < end ? kernel[static_cast<std::size_t>(std::max<std::int64_t>(point, 0))] : 0.0f;
}

std::size_t roundUp(std::size_t n) {
    return (n + kVectorLanes - 1) / kVectorLanes * kVectorLanes;
}

}  // namespace

std::shared_ptr<InterpolationFilter const> InterpolationFilter::forRates(std::uint64_t inRate,
                                                                         std::uint64_t outRate) {
    static std::mutex lock;
    using Steps = std::pair<std::uint64_t, std::uint64_t>;
    static auto& known = keepForEver(std::map<Steps, std::weak_ptr<InterpolationFilter const>>());
    std::uint64_t const divisor = std::gcd(inRate, outRate);
    Steps const steps(inRate / divisor, outRate / divisor);
    std::lock_guard const guard(lock);
    if (auto shared = known[steps].lock()) return shared;
    auto made = std::make_shared<InterpolationFilter const>(steps.first, steps.second);
    known[steps] = made;
    return made;
}

InterpolationFilter::InterpolationFilter(std::uint64_t inStep, std::uint64_t outStep)
    : inStep_(inStep),
      outStep_(outStep),
      scale_(std::min(1.0, static_cast<double>(outStep) / static_cast<double>(inStep))),
      reach_(static_cast<std::ptrdiff_t>(kCrossings / scale_)),
      taps_(roundUp(2 * static_cast<std::size_t>(reach_) + 2)) {
    if (outStep > kMaxCoefficients / (kRowsPerPhase * taps_)) {
        raise("The resampler's filter for these rates would be too large",
              "src/resampler/interpolation_filter", "InterpolationFilter");
    }
    phases_.reserve(static_cast<std::size_t>(outStep));
    for (std::uint64_t phase = 0; phase < outStep; ++phase) {
        Row const none = exactRow(phase);
        Row const behind = driftedRow(phase, Drift::behind);
        Row const ahead = driftedRow(phase, Drift::ahead);
        std::uint32_t const first = store(behind);
        std::uint32_t const middle = none == behind ? first : store(none);
        phases_.push_back({static_cast<double>(phase) / static_cast<double>(outStep),
                           {first, middle, ahead == behind ? first : store(ahead)}});
    }
    coefficients_.shrink_to_fit();
}

std::size_t InterpolationFilter::margin(double factor) {
    return static_cast<std::size_t>((kCrossings + 1) * std::max(1.0, 1.0 / factor) + 10.0);
}

// No drift: the position is the double nearest to the fraction, and distances grow by a double
// step from tap to tap.
InterpolationFilter::Row InterpolationFilter::exactRow(std::uint64_t phase) const {
    Row row(taps_, 0.0f);
    double const step = static_cast<double>(kGridPoints) * scale_;
    double const fraction = static_cast<double>(phase) / static_cast<double>(outStep_);
    float const gain = static_cast<float>(scale_);
    double left = fraction * step;
    double right = (1.0 - fraction) * step;
    for (std::ptrdiff_t i = 0; i <= reach_; ++i) {
        row[static_cast<std::size_t>(reach_ - i)] =
            gain * coefficient(static_cast<std::int64_t>(left), false);
        row[static_cast<std::size_t>(reach_ + 1 + i)] =
            gain * coefficient(static_cast<std::int64_t>(right), true);
        left += step;
        right += step;
    }
    return row;
}

// Exact fractions; where a tap falls on a grid point, the side on which the clock lies decides.
InterpolationFilter::Row InterpolationFilter::driftedRow(std::uint64_t phase, Drift drift) const {
    Row row(taps_, 0.0f);
    float const gain = static_cast<float>(scale_);
    std::uint64_t const denominator = std::max(inStep_, outStep_);
    auto const point = [&](std::uint64_t distance, bool towardsCentre) {
        std::uint64_t const scaled = distance * static_cast<std::uint64_t>(kGridPoints);
        bool const hit = scaled % denominator == 0;
        return static_cast<std::int64_t>(scaled / denominator) - (hit && towardsCentre ? 1 : 0);
    };
    for (std::ptrdiff_t i = 0; i <= reach_; ++i) {
        std::uint64_t const whole = static_cast<std::uint64_t>(i) * outStep_;
        row[static_cast<std::size_t>(reach_ - i)] =
            gain * coefficient(point(whole + phase, drift == Drift::behind), false);
        row[static_cast<std::size_t>(reach_ + 1 + i)] =
            gain * coefficient(point(whole + outStep_ - phase, drift == Drift::ahead), true);
    }
    return row;
}

std::uint32_t InterpolationFilter::store(Row const& row) {
    auto const offset = static_cast<std::uint32_t>(coefficients_.size());
    coefficients_.insert(coefficients_.end(), row.begin(), row.end());
    return offset;
}

}  // namespace MORVA::UTILS
