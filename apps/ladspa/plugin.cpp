#include "plugin.h"

#include <cmath>
#include <span>
#include <stdexcept>
#include <string>
#include <utility>

#include "morva-sdk/morva-ext.h"

namespace morva::ladspa {
namespace {

// The shortest frame that sessions take: the FIFO's delay.
constexpr int kFrameMs = 10;

// Hosts may send anything through a control port.
float sensibleLimit(float limitDb) {
    return limitDb > 0.0F ? std::min(limitDb, kNoLimitDb) : 0.0F;
}

}  // namespace

void Plugin::CloseSession::operator()(void* session) const {
    Morva_NC_CloseSession(session);
}

Plugin::Plugin(std::size_t channels, unsigned long rateHz)
    : rateHz_(static_cast<int>(rateHz)), ports_(portCount(channels)) {
    for (std::size_t c = 0; c < channels; ++c) {
        channels_.push_back({nullptr, FrameFifo(rateHz * kFrameMs / 1000)});
    }
    openSessions();
}

// All or nothing: what was open stays open when one of the new ones fails.
void Plugin::openSessions() {
    auto const rate = static_cast<MorvaSamplingRate>(rateHz_);
    std::vector<Session> fresh(channels_.size());
    for (auto& session : fresh) {
        session.reset(
            Morva_NC_CreateSession(rate, rate, MORVA_FRAME_10_MS, SharedEngine::modelFor(rateHz_)));
        if (!session) {
            throw std::runtime_error("no session at " + std::to_string(rateHz_) +
                                     " Hz: " + MorvaExt_LastError());
        }
    }
    for (std::size_t c = 0; c < channels_.size(); ++c) {
        channels_[c].session = std::move(fresh[c]);
        channels_[c].fifo.reset();
    }
    auto const& first = channels_.front();
    latency_ = static_cast<float>(MorvaExt_SessionLatencySamples(first.session.get())) +
               static_cast<float>(first.fifo.delay());
    limitDb_ = kNoLimitDb;
    bypass_ = false;
}

void Plugin::activate() {
    openSessions();
}

void Plugin::followControls() {
    auto const* const limit = control(Control::attenuationLimit);
    auto const* const bypass = control(Control::bypass);
    float const limitDb = limit != nullptr ? sensibleLimit(*limit) : kNoLimitDb;
    bool const on = bypass != nullptr && *bypass > 0.0F;
    for (auto const& channel : channels_) {
        if (limitDb != limitDb_) {
            MorvaExt_NC_SetAttenuationLimit(channel.session.get(),
                                            limitDb < kNoLimitDb ? limitDb : INFINITY);
        }
        if (on != bypass_) MorvaExt_NC_SetBypass(channel.session.get(), on ? 1 : 0);
    }
    limitDb_ = limitDb;
    bypass_ = on;
}

void Plugin::run(std::size_t samples) {
    followControls();
    if (auto* const latency = control(Control::latency)) *latency = latency_;
    for (std::size_t c = 0; c < channels_.size(); ++c) {
        auto& channel = channels_[c];
        auto const* const in = ports_[c];
        auto* const out = ports_[channels_.size() + c];
        if (in == nullptr || out == nullptr) continue;
        channel.fifo.run({in, samples}, {out, samples},
                         [&](std::span<float const> dirty, std::span<float> clean) {
                             Morva_NC_CleanAmbientNoiseFloat(channel.session.get(), dirty.data(),
                                                             static_cast<unsigned>(dirty.size()),
                                                             clean.data(),
                                                             static_cast<unsigned>(clean.size()));
                         });
    }
}

}  // namespace morva::ladspa
