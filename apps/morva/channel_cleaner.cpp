#include "channel_cleaner.h"

#include <algorithm>

namespace morva::cli {
ChannelCleaner::ChannelCleaner(Engine& engine, int fileRateHz, SessionSetup const& setup)
    : session_(engine, setup),
      toEngine_(fileRateHz, setup.rateHz),
      toWhole_(session_.latency()),
      fromEngine_(setup.rateHz, fileRateHz),
      frameSize_(setup.frameSize()),
      toSkip_(toWhole_.wholeDelay()),
      frame_(frameSize_) {}

void ChannelCleaner::push(std::span<float const> in, std::vector<float>& out) {
    in_ += static_cast<std::int64_t>(in.size());
    auto const before = pending_.size();
    toEngine_.push(in, pending_);
    fed_ += static_cast<std::int64_t>(pending_.size() - before);
    takeFrames(out);
}

void ChannelCleaner::finish(std::vector<float>& out) {
    auto const before = pending_.size();
    toEngine_.finish(pending_);
    fed_ += static_cast<std::int64_t>(pending_.size() - before);
    takeFrames(out);
    while (released_ < fed_) {  // silence pushes the last samples out of the session
        pending_.resize(std::max(pending_.size(), frameSize_));
        takeFrames(out);
    }
    auto const start = out.size();
    fromEngine_.finish(out);
    out_ += static_cast<std::int64_t>(out.size() - start);
    // The converters may differ from the exact length by a sample.
    out.resize(out.size() + static_cast<std::size_t>(std::max<std::int64_t>(in_ - out_, 0)));
    if (out_ > in_)
        out.resize(out.size() -
                   std::min<std::size_t>(out.size(), static_cast<std::size_t>(out_ - in_)));
    out_ = in_;
}

void ChannelCleaner::takeFrames(std::vector<float>& out) {
    std::size_t at = 0;
    for (; pending_.size() - at >= frameSize_; at += frameSize_) {
        session_.clean(std::span(pending_).subspan(at, frameSize_), frame_);
        aligned_.clear();
        toWhole_.push(frame_, aligned_);
        release(aligned_, out);
    }
    pending_.erase(pending_.begin(), pending_.begin() + static_cast<std::ptrdiff_t>(at));
}

void ChannelCleaner::release(std::span<float const> cleaned, std::vector<float>& out) {
    auto const skipped = std::min(toSkip_, static_cast<std::int64_t>(cleaned.size()));
    toSkip_ -= skipped;
    cleaned = cleaned.subspan(static_cast<std::size_t>(skipped));
    cleaned = cleaned.first(std::min(
        cleaned.size(), static_cast<std::size_t>(std::max<std::int64_t>(fed_ - released_, 0))));
    released_ += static_cast<std::int64_t>(cleaned.size());
    auto const start = out.size();
    fromEngine_.push(cleaned, out);
    out_ += static_cast<std::int64_t>(out.size() - start);
}

}  // namespace morva::cli
