// What runs once per frame allocates nothing after its first frames.
#include <gtest/gtest.h>

#include "support/allocation_counter.h"
#include "support/random.h"
#include "utils/background_speaker_fix.h"
#include "utils/cyclic_block_data.h"
#include "utils/en_threshold.h"
#include "utils/fft.h"
#include "utils/mat_mul.h"
#include "utils/mean_energy.h"
#include "utils/noise.h"
#include "utils/resampler.h"
#include "utils/vector_rms.h"

using test_support::countAllocations;
using test_support::Random;

namespace {

// Runs a few frames, then counts over many.
template <class Frame>
std::size_t allocationsAfterWarmUp(Frame frame) {
    for (int i = 0; i < 3; ++i) frame();
    return countAllocations([&] {
        for (int i = 0; i < 500; ++i) frame();
    });
}

}  // namespace

TEST(FrameAllocation, TheCounterCounts) {
    EXPECT_GT(countAllocations(
                  [] { std::vector<float>(3).swap(*std::make_unique<std::vector<float>>()); }),
              0u);
}

TEST(FrameAllocation, Statistics) {
    Random random(1);
    std::vector<float> frame = random.normal(320, 1000.0f);
    MORVA::UTILS::EnThreshold gate(10, 100, 1.0f);
    MORVA::UTILS::MeanEnergy mean(10, 400, 1.0f, 4e6f);  // grows all the time
    MORVA::UTILS::BackgroundSpeakerFix speaker(10.0f, 15.0f, 40, 2, 2.0f, true, 30, frame);
    MORVA::UTILS::Noise noise(4, 320);
    for (int i = 0; i < 4; ++i) noise.addNullFrameNoise();
    EXPECT_EQ(allocationsAfterWarmUp([&] {
                  gate.setCurrentData(frame);
                  mean.setCurrentData(frame.data(), frame.size());
                  speaker.frame_compute(frame);
                  noise.addFrameNoiseRemoveBack(frame.data(), frame.size());
                  noise.calculateNoise();
                  MORVA::UTIL_FUNCTIONS::vectorRMS(frame);
              }),
              0u);
}

TEST(FrameAllocation, QueueTransformAndProducts) {
    Random random(2);
    std::vector<float> const block = random.normal(320);
    MORVA::CONTAINERS::CyclicBlockData queue(960);
    auto const fft = MORVA::UTILS::FFT::create(320);
    std::vector<std::complex<float>> spectrum;
    std::vector<float> back;
    MORVA::CONTAINERS::Matrix const W{random.normal(320 * 64), 320, 64};
    std::vector<float> const bias(64);
    std::vector<float> out;
    EXPECT_EQ(allocationsAfterWarmUp([&] {
                  queue.push_back(block.data(), block.size());
                  queue.start += block.size();
                  fft->computeForward(block, spectrum);
                  fft->computeBackward(spectrum, back);
                  MORVA::UTIL_FUNCTIONS::matMulPlusB(block, W, bias, out);
              }),
              0u);
}

TEST(FrameAllocation, Resampler) {
    for (auto const& [in, out] : {std::pair(480ul, 320ul), std::pair(80ul, 960ul),
                                  std::pair(441ul, 160ul), std::pair(160ul, 160ul)}) {
        MORVA::UTILS::Resampler resampler(in, out);
        std::vector<float> const block(in, 1.0f);
        std::vector<float> converted;
        EXPECT_EQ(allocationsAfterWarmUp([&] { resampler.resample(block, converted); }), 0u);
    }
}
