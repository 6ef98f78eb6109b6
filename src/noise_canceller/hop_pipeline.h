// Fits the caller's frames to the model's hops: queues samples, calls the model once per hop on a
// frame of two hops, overlap-adds what it returns, and hands back frames of the caller's length at
// a fixed delay. All lengths in samples at the model's rate unless a name says Ms.
#pragma once

#include <cstddef>
#include <span>
#include <vector>

#include "utils/cyclic_block_data.h"

namespace MORVA::NOISE_CANCELLER {

class HopPipeline {
public:
    struct Shape {
        std::size_t rateHz;
        std::size_t hop;
        std::size_t modelFrameMs;
        std::size_t sessionFrameMs;
    };

    // The hop of input that a model step stands for, and the hop of output that it completes.
    struct CompletedHop {
        std::span<float const> input;
        std::span<float const> output;
    };

    explicit HopPipeline(Shape const& shape);

    // From sound in to sound out; 0 for a pair of frame lengths that is not supported.
    std::size_t delay() const { return delay_; }

    // Empties both queues and fills them with their initial silence.
    void reset();

    // `model(std::span<float const> in, std::vector<float>& out)` reads two hops and leaves two
    // windowed hops. `observe(CompletedHop)` is called after each of them. `frame` holds one
    // session frame; it is replaced by as many delayed output samples. Throws MORVA_Exception for a
    // frame of another length and for a pair of frame lengths that is not supported.
    template <class Model, class Observe>
    void process(std::vector<float>& frame, Model&& model, Observe&& observe) {
        if (frame.size() != sessionFrame() || delay_ == 0) refuseFrame(frame.size());
        input_.push_back(frame.data(), frame.size());
        while (input_.unread() >= 2 * shape_.hop) {
            model(std::span<float const>(input_.readPosition(), 2 * shape_.hop), modelFrame_);
            overlapAdd();
            observe(CompletedHop{{input_.readPosition(), shape_.hop}, completedOutput()});
            input_.start += shape_.hop;
        }
        takeOutput(frame);
    }

    template <class Model>
    void process(std::vector<float>& frame, Model&& model) {
        process(frame, model, [](CompletedHop const&) {});
    }

private:
    std::size_t sessionFrame() const { return shape_.rateHz * shape_.sessionFrameMs / 1000; }
    [[noreturn]] void refuseFrame(std::size_t length) const;
    void overlapAdd();
    std::span<float const> completedOutput() const;
    void takeOutput(std::vector<float>& frame);

    Shape shape_;
    std::size_t delay_;
    CONTAINERS::CyclicBlockData input_;
    CONTAINERS::CyclicBlockData output_;
    std::vector<float> modelFrame_;
};

}  // namespace MORVA::NOISE_CANCELLER
