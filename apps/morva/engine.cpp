#include "engine.h"

#include "error.h"
#include "morva-ext.h"
#include "morva-sdk/vocabulary.h"
#include "streams.h"
#include "utils/utf8.h"

namespace morva::cli {
namespace {

std::string withReason(std::string const& what, EngineTalk const& talk) {
    auto const reason = talk.reason();
    return reason.empty() ? what : what + ": " + reason;
}

template <class Create>
SessionHandle open(SessionSetup const& setup, int (*close)(void*), Create create) {
    EngineTalk const talk;
    SessionHandle session(
        create(static_cast<MorvaSamplingRate>(setup.rateHz),
               static_cast<MorvaFrameDuration>(setup.frameMs), setup.model.c_str()),
        close);
    if (!session) throw Error(withReason(setup.model + ": the model cannot be used", talk));
    return session;
}

unsigned int count(std::span<float const> frame) {
    return static_cast<unsigned int>(frame.size());
}

void mustSucceed(int code) {
    if (code != 0) throw Error("the engine refused a frame");
}

}  // namespace

std::size_t SessionSetup::frameSize() const {
    return MORVA::MORVA_SDK::getSampleCount(static_cast<MorvaFrameDuration>(frameMs),
                                            static_cast<MorvaSamplingRate>(rateHz));
}

std::wstring wide(std::filesystem::path const& path) {
    auto const bytes = path.u8string();
    return MORVA::UTILS::toWide(std::string(bytes.begin(), bytes.end()));
}

Engine::Engine() {
    EngineTalk const talk;
    if (Morva_SDK_GlobalInit(nullptr, 1) != 0) {
        throw Error(withReason("the engine cannot start", talk));
    }
}

Engine::~Engine() {
    Morva_SDK_GlobalDestroy();
}

void Engine::addModel(std::filesystem::path const& file, std::string const& name) {
    EngineTalk const talk;
    if (Morva_SDK_SetModel(wide(file).c_str(), name.c_str()) != 0) {
        throw Error(withReason(name + ": not a usable model", talk));
    }
}

CleaningSession::CleaningSession(Engine& /*engine*/, SessionSetup const& setup)
    : session_(open(setup, &Morva_NC_CloseSession, [](auto rate, auto frame, auto model) {
          return Morva_NC_CreateSession(rate, rate, frame, model);
      })) {
    if (MorvaExt_SessionExactLatency(session_.get(), &latency_) != 0)
        throw Error("the engine does not say its latency");
    if (MorvaExt_NC_SetAttenuationLimit(session_.get(), setup.limitDb) != 0)
        throw Error("the engine refuses this attenuation limit");
}

void CleaningSession::clean(std::span<float const> in, std::span<float> out) {
    mustSucceed(Morva_NC_CleanAmbientNoiseFloat(session_.get(), in.data(), count(in), out.data(),
                                                count(out)));
}

VoiceSession::VoiceSession(Engine& /*engine*/, SessionSetup const& setup)
    : session_(open(setup, &Morva_VAD_CloseSession, &Morva_VAD_CreateSession)) {}

float VoiceSession::score(std::span<float const> frame) {
    float const score = Morva_VAD_FrameFloat(session_.get(), frame.data(), count(frame));
    if (score < 0.0F) {
        throw Error("the voice-activity model gives scores outside 0..1: it is not calibrated");
    }
    return score;
}

LevelSession::LevelSession(Engine& /*engine*/, SessionSetup const& setup)
    : session_(open(setup, &Morva_NoiseDB_CloseSession, &Morva_NoiseDB_CreateSession)) {}

float LevelSession::level(std::span<float const> frame) {
    float level = 0.0F;
    mustSucceed(MorvaExt_NoiseDB_FrameFloat(session_.get(), frame.data(), count(frame), &level));
    return level;
}

}  // namespace morva::cli
