// The least that a frame could cost on this machine: every weight read once at the measured
// bandwidth, and the operations of transforms, resamplers and layers that many groups of bands run
// through at the measured peak rate. What it leaves out: logarithms, exponentials, statistics,
// copies, and the products of other layers, which hide behind the reading.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

namespace morva_bench {

struct FrameWork {
    std::string model;
    int rate;                // of the caller, hertz
    std::size_t parameters;  // of the network's matrices
    double weightBytes;      // as laid out for the products, per frame of 10 ms
    double operations;       // transforms, resamplers, shared layers, per frame of 10 ms
};

// What one frame of the model in `file` needs. Its own rate decides whether it is resampled.
FrameWork frameWork(std::string const& model, std::string const& file, int rate);

class Machine {
public:
    Machine();
    // Measures again and keeps the best of all measurements.
    void measure();

    double memoryBytesPerSecond() const { return memory_; }
    double operationsPerSecond() const { return peak_; }
    // Of a block as large as these weights, read again and again: from the cache they live in.
    double bytesPerSecond(FrameWork const& work) const;
    // Seconds per frame.
    double floor(FrameWork const& work, double weightBytesPerSecond) const {
        return work.weightBytes / weightBytesPerSecond + work.operations / peak_;
    }

private:
    std::vector<float> values_;  // far beyond the caches
    double memory_ = 0.0;
    double peak_ = 0.0;
};

}  // namespace morva_bench
