// Coefficients of the band-limited interpolator: a windowed sinc, cut into one row of taps for
// every position that an output sample can have between two input samples.
//
// The method is band-limited interpolation after J. O. Smith: a Kaiser-windowed sinc (beta 6,
// cutoff 0.9 of the lower Nyquist rate, 17 zero crossings to each side), known on a grid of 4096
// points per crossing; a tap takes the nearest grid point towards the centre. Rows depend on the
// ratio only and are shared by all streams of one ratio. Immutable; any thread.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <vector>

namespace MORVA::UTILS {

class InterpolationFilter {
public:
    // Where the stream's clock lies against the exact position of an output sample. A clock of
    // doubles drifts by parts of 1e-13, which decides between two grid points where a tap falls
    // exactly on one.
    enum class Drift { behind, none, ahead };

    // The rows for outRate / inRate. Throws MORVA_Exception when they would take more than 16 MiB
    // (rates without a useful common divisor). [control thread]
    static std::shared_ptr<InterpolationFilter const> forRates(std::uint64_t inRate,
                                                               std::uint64_t outRate);

    InterpolationFilter(std::uint64_t inStep, std::uint64_t outStep);

    // Output sample k lies at input position k * inStep / outStep; its phase is the numerator of
    // the fraction, k * inStep mod outStep.
    std::uint64_t inStep() const { return inStep_; }
    std::uint64_t outStep() const { return outStep_; }

    // taps() coefficients, a multiple of 8, for the inputs from firstTap() (negative) onwards,
    // counted from the input sample at or before the exact position.
    float const* row(std::size_t phase, Drift drift) const {
        return coefficients_.data() + phases_[phase].rows[static_cast<std::size_t>(drift)];
    }
    double fraction(std::size_t phase) const { return phases_[phase].fraction; }
    std::size_t taps() const { return taps_; }
    std::ptrdiff_t firstTap() const { return -reach_; }

    // Input samples kept on each side of a position.
    static std::size_t margin(double factor);

private:
    using Row = std::vector<float>;
    static constexpr std::size_t kRowsPerPhase = 3;  // one by drift, some of them the same
    struct Phase {
        double fraction;
        std::array<std::uint32_t, kRowsPerPhase> rows;  // offsets
    };

    Row exactRow(std::uint64_t phase) const;
    Row driftedRow(std::uint64_t phase, Drift drift) const;
    std::uint32_t store(Row const& row);

    std::uint64_t inStep_;
    std::uint64_t outStep_;
    double scale_;  // below 1 the kernel is stretched, so that it cuts at the output's Nyquist rate
    std::ptrdiff_t reach_;
    std::size_t taps_;
    std::vector<Phase> phases_;
    std::vector<float> coefficients_;
};

}  // namespace MORVA::UTILS
