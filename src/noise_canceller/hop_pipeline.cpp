#include "noise_canceller/hop_pipeline.h"

#include <algorithm>
#include <array>
#include <string>

#include "utils/exception.h"

namespace MORVA::NOISE_CANCELLER {
namespace {

// Both queues hold the longest session frame (40 ms) beside what the hops leave over.
constexpr std::size_t kQueueHops = 8;

struct DelayRow {
    std::size_t modelFrameMs;
    std::array<std::size_t, 6> delayMs;
};
constexpr std::array<std::size_t, 6> kSessionFramesMs = {10, 15, 20, 30, 32, 40};
constexpr DelayRow kDelays[] = {
    {20, {10, 15, 10, 10, 18, 10}},
    {30, {25, 15, 25, 15, 29, 25}},
    {32, {31, 28, 28, 30, 16, 28}},
};

// 0 for a pair that is not supported.
std::size_t pipelineDelayMs(std::size_t modelFrameMs, std::size_t sessionFrameMs) {
    auto const column = std::find(kSessionFramesMs.begin(), kSessionFramesMs.end(), sessionFrameMs);
    auto const row =
        std::find_if(std::begin(kDelays), std::end(kDelays),
                     [&](DelayRow const& each) { return each.modelFrameMs == modelFrameMs; });
    if (column == kSessionFramesMs.end() || row == std::end(kDelays)) return 0;
    return row->delayMs[static_cast<std::size_t>(column - kSessionFramesMs.begin())];
}

}  // namespace

HopPipeline::HopPipeline(Shape const& shape)
    : shape_(shape),
      delay_(pipelineDelayMs(shape.modelFrameMs, shape.sessionFrameMs) * shape.rateHz / 1000),
      input_(kQueueHops * shape.hop),
      output_(kQueueHops * shape.hop),
      modelFrame_(2 * shape.hop) {
    reset();
}

void HopPipeline::reset() {
    input_.start = input_.end = 0;
    output_.start = output_.end = 0;
    input_.push_backNULL(shape_.hop);
    output_.push_backNULL(delay_);
}

void HopPipeline::refuseFrame(std::size_t length) const {
    UTILS::raise("a frame of " + std::to_string(length) + " samples, must be " +
                     std::to_string(sessionFrame()),
                 "src/noise_canceller/hop_pipeline", "process");
}

void HopPipeline::overlapAdd() {
    output_.push_backNULL(shape_.hop);
    float* const target = output_.data.data() + output_.end - modelFrame_.size();
    for (std::size_t i = 0; i < modelFrame_.size(); ++i) target[i] += modelFrame_[i];
}

std::span<float const> HopPipeline::completedOutput() const {
    return {output_.data.data() + output_.end - 2 * shape_.hop, shape_.hop};
}

void HopPipeline::takeOutput(std::vector<float>& frame) {
    std::copy_n(output_.readPosition(), frame.size(), frame.begin());
    output_.start += frame.size();
}

}  // namespace MORVA::NOISE_CANCELLER
