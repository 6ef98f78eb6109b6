#include "morva-sdk/instance.h"

#include <algorithm>
#include <atomic>

#include "utils/diagnostics.h"
#include "utils/exception.h"

namespace MORVA::MORVA_SDK {
namespace {

constexpr char const* kUnit = "src/morva-sdk/instance";

// Sessions without sound of their own are built for this output rate.
constexpr MorvaSamplingRate kValueSessionRate = MORVA_RATE_16000;

// Owns the instance, and is what audio threads read. A plain pointer on purpose: process exit,
// which an audio thread may meet inside a frame, destroys nothing.
std::atomic<MorvaInstanceT*> current{nullptr};

}  // namespace

MorvaInstanceT* MorvaInstanceT::Instance(MODE mode, wchar_t const* path) {
    switch (mode) {
        case MODE::get: {
            auto* const instance = current.load(std::memory_order_acquire);
            if (instance == nullptr) {
                UTILS::raise("TRY TO GET NULL INSTANCE,ISN'T INITIALIZED", kUnit, "Instance");
            }
            return instance;
        }
        case MODE::create: {
            std::lock_guard const lock(mutexForInputs_);
            if (current.load(std::memory_order_relaxed) != nullptr) {
                UTILS::raise("DOUBLE INITIALIZATION WITHOUT DESTROYING", kUnit, "Instance");
            }
            auto fresh = std::make_unique<MorvaInstanceT>(path != nullptr ? path : L"");
            current.store(fresh.get(), std::memory_order_release);
            return fresh.release();
        }
        case MODE::destroy: {
            std::lock_guard const lock(mutexForInputs_);
            std::unique_ptr<MorvaInstanceT> const last(current.exchange(nullptr));
            if (!last) UTILS::raise("DESTROYING WITHOUT INTIALIZATION", kUnit, "Instance");
            return nullptr;
        }
    }
    UTILS::raise("Incorrect instance access mode...", kUnit, "Instance");
}

MorvaInstanceT::MorvaInstanceT(wchar_t const* path) : registry_(path) {}

MorvaInstanceT::~MorvaInstanceT() {
    clearAll();
}

MorvaSessionT* MorvaInstanceT::createSession(MorvaSamplingRate inputRate,
                                             MorvaSamplingRate outputRate,
                                             MorvaFrameDuration duration, char const* modelName,
                                             MorvaSessionType type) {
    std::lock_guard const lock(mutexForInputs_);
    std::list<std::unique_ptr<MorvaSessionT>> fresh;
    fresh.push_back(
        std::make_unique<MorvaSessionT>(inputRate, outputRate, duration, modelName, type));
    auto* const session = fresh.back().get();
    directory_.add(session);
    sessions_.splice(sessions_.end(), fresh);
    return session;
}

MorvaSessionT* MorvaInstanceT::createNCSession(MorvaSamplingRate inputRate,
                                               MorvaSamplingRate outputRate,
                                               MorvaFrameDuration duration, char const* modelName) {
    return createSession(inputRate, outputRate, duration, modelName,
                         MorvaSessionType::NoiseCancellation);
}

MorvaSessionT* MorvaInstanceT::createVADSession(MorvaSamplingRate rate, MorvaFrameDuration duration,
                                                char const* modelName) {
    return createSession(rate, kValueSessionRate, duration, modelName,
                         MorvaSessionType::VoiceActivity);
}

MorvaSessionT* MorvaInstanceT::createNoiseDBSession(MorvaSamplingRate rate,
                                                    MorvaFrameDuration duration,
                                                    char const* modelName) {
    return createSession(rate, kValueSessionRate, duration, modelName,
                         MorvaSessionType::NoiseLevel);
}

bool MorvaInstanceT::isSessionTrue(MorvaSessionT* session) const {
    return directory_.contains(session);
}

MorvaSessionType MorvaInstanceT::getSessionType(MorvaSessionT* session) const {
    return directory_.contains(session) ? session->getType() : MorvaSessionType::Unknown;
}

bool MorvaInstanceT::destroySession(MorvaSessionT* session) {
    std::lock_guard const lock(mutexForInputs_);
    if (remove(session)) return true;
    UTILS::say(UTILS::Channel::output, "WARNING SESSION ISN'T FOUND");
    return false;
}

bool MorvaInstanceT::closeSession(MorvaSessionT* session, MorvaSessionType type) {
    std::lock_guard const lock(mutexForInputs_);
    return getSessionType(session) == type && remove(session);
}

bool MorvaInstanceT::remove(MorvaSessionT const* session) {
    auto const found = std::find_if(sessions_.begin(), sessions_.end(),
                                    [&](auto const& owned) { return owned.get() == session; });
    if (found == sessions_.end()) return false;
    directory_.remove(session);
    sessions_.erase(found);
    return true;
}

bool MorvaInstanceT::clearAll() {
    for (auto const& session : sessions_) directory_.remove(session.get());
    sessions_.clear();
    registry_.clear();
    return true;
}

}  // namespace MORVA::MORVA_SDK
