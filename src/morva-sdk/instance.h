// The engine's one process-wide object: the registered models and the open sessions.
//
// One lock serialises creation and destruction of the instance, registration, and opening and
// closing of sessions. Getting the instance and asking about a session take no lock: audio threads
// do both while a control thread works on other sessions.
//
// Only MODE::destroy ends it. At process exit it is left as it is, sessions and all, since audio
// threads may still be inside a frame.
#pragma once

#include <cstddef>
#include <list>
#include <memory>
#include <mutex>

#include "morva-sdk/morva-sdk.h"
#include "morva-sdk/session.h"
#include "morva-sdk/session_directory.h"
#include "morva-sdk/vocabulary.h"
#include "utils/non_copyable.h"
#include "weights/model_registry.h"

namespace MORVA::MORVA_SDK {

class MorvaInstanceT : public UTILS::NonCopyMovable {
public:
    enum class MODE : int { get = 0, create = 1, destroy = 2 };

    // get: the instance, or MORVA_Exception when there is none. create: a new one with this working
    // path (null: none). destroy: frees it and returns null. `path` is read by create only.
    static MorvaInstanceT* Instance(MODE mode, wchar_t const* path);

    // For Instance: everyone else asks it.
    explicit MorvaInstanceT(wchar_t const* path);
    ~MorvaInstanceT();

    // [control thread] Take the lock. Exceptions of the session's constructor leave everything as
    // it was.
    MorvaSessionT* createNCSession(MorvaSamplingRate inputRate, MorvaSamplingRate outputRate,
                                   MorvaFrameDuration duration, char const* modelName);
    MorvaSessionT* createVADSession(MorvaSamplingRate rate, MorvaFrameDuration duration,
                                    char const* modelName);
    MorvaSessionT* createNoiseDBSession(MorvaSamplingRate rate, MorvaFrameDuration duration,
                                        char const* modelName);
    bool destroySession(MorvaSessionT* session);
    // The same for a session that must be of this kind, which is looked at under the lock: false,
    // and nothing is said, for any other handle.
    bool closeSession(MorvaSessionT* session, MorvaSessionType type);

    // [any thread]
    bool isSessionTrue(MorvaSessionT* session) const;
    MorvaSessionType getSessionType(MorvaSessionT* session) const;

    // Drops sessions, models and the working path. The caller holds the lock, or is alone.
    bool clearAll();

    // Registration, see ModelRegistry. The caller holds the lock.
    bool addWeightWithControlFile(wchar_t const* path, char const* modelName) {
        return registry_.addWeightWithControlFile(path, modelName);
    }
    bool addWeightBlob(char const* data, std::size_t size, char const* modelName) {
        return registry_.addWeightBlob(data, size, modelName);
    }
    WEIGHTS::ModelRegistry const& registry() const { return registry_; }

    static inline std::mutex mutexForInputs_;

private:
    MorvaSessionT* createSession(MorvaSamplingRate inputRate, MorvaSamplingRate outputRate,
                                 MorvaFrameDuration duration, char const* modelName,
                                 MorvaSessionType type);
    bool remove(MorvaSessionT const* session);

    WEIGHTS::ModelRegistry registry_;
    std::list<std::unique_ptr<MorvaSessionT>> sessions_;
    SessionDirectory directory_;
};

}  // namespace MORVA::MORVA_SDK
