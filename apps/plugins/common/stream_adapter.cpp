#include "stream_adapter.h"

#include <algorithm>
#include <cmath>
#include <stdexcept>
#include <utility>

#include "morva-sdk/morva-ext.h"

namespace morva::plugins {
namespace {

// The shortest frame that sessions take: the FIFO's delay.
constexpr int kFrameMs = 10;

// Hosts may send anything through a control port.
float sensibleLimit(float limitDb) {
    return limitDb > 0.0F ? std::min(limitDb, kNoLimitDb) : 0.0F;
}

std::size_t frameLength(int rateHz) {
    return static_cast<std::size_t>(std::max(rateHz, 0)) * kFrameMs / 1000;
}

}  // namespace

void StreamAdapter::CloseSession::operator()(void* session) const {
    Morva_NC_CloseSession(session);
}

StreamAdapter::StreamAdapter(Setup setup)
    : setup_(std::move(setup)), fifo_(setup_.channels, frameLength(setup_.rateHz)) {
    if (setup_.model.empty()) setup_.model = SharedEngine::cleanerFor(setup_.rateHz);
    restart();
}

StreamAdapter::Session StreamAdapter::openSession() {
    auto const rate = static_cast<MorvaSamplingRate>(setup_.rateHz);
    engine_.use(setup_.model);
    Session session(Morva_NC_CreateSession(rate, rate, MORVA_FRAME_10_MS, setup_.model.c_str()));
    if (!session) {
        auto const what = "no session at " + std::to_string(setup_.rateHz) + " Hz";
        throw std::runtime_error(SharedEngine::reason(what));
    }
    if (!setup_.meters) return session;
    auto const* const voice = SharedEngine::voiceModel();
    engine_.use(voice);
    if (MorvaExt_NC_EnableVoice(session.get(), voice) != 0) {
        throw std::runtime_error(SharedEngine::reason("no voice score"));
    }
    return session;
}

void StreamAdapter::restart() {
    std::vector<Session> fresh(setup_.channels);
    for (auto& session : fresh) session = openSession();
    sessions_ = std::move(fresh);
    fifo_.reset();
    latency_ = fifo_.delay() +
               static_cast<std::size_t>(MorvaExt_SessionLatencySamples(sessions_.front().get()));
    settings_ = {};
    meters_ = {};
}

void StreamAdapter::follow(Settings const& settings) {
    Settings const wanted{sensibleLimit(settings.limitDb), settings.bypass};
    if (wanted == settings_) return;
    for (auto const& session : sessions_) {
        MorvaExt_NC_SetAttenuationLimit(session.get(),
                                        wanted.limitDb < kNoLimitDb ? wanted.limitDb : INFINITY);
        MorvaExt_NC_SetBypass(session.get(), wanted.bypass ? 1 : 0);
    }
    settings_ = wanted;
}

void StreamAdapter::run(std::span<Lane const> lanes, std::size_t samples,
                        Settings const& settings) {
    follow(settings);
    fifo_.run(lanes, samples,
              [this](auto channel, auto in, auto out) { cleanFrame(channel, in, out); });
}

void StreamAdapter::cleanFrame(std::size_t channel, std::span<float const> in,
                               std::span<float> out) {
    auto* const session = sessions_[channel].get();
    Morva_NC_CleanAmbientNoiseFloat(session, in.data(), static_cast<unsigned>(in.size()),
                                    out.data(), static_cast<unsigned>(out.size()));
    if (!setup_.meters) return;
    Meters read;
    MorvaExt_NC_FrameMeters(session, &read.voice, &read.levelDb);
    if (channel == 0) meters_ = {0.0F, read.levelDb};
    meters_.voice = std::max(meters_.voice, read.voice);
    meters_.levelDb = std::max(meters_.levelDb, read.levelDb);
}

}  // namespace morva::plugins
