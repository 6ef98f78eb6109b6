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
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "morva-sdk/morva-sdk.h"
#include "morva-sdk/session.h"
#include "morva-sdk/session_directory.h"
#include "morva-sdk/vocabulary.h"
#include "utils/non_copyable.h"
#include "utils/path.h"
#include "weights/model_environment.h"

namespace MORVA::MORVA_SDK {

class MorvaInstanceT : public UTILS::NonCopyMovable {
public:
    using ModelEnvironment = CONTAINERS::ModelEnvironment;
    using WeightAndIdentifier = std::pair<std::shared_ptr<WEIGHTS::Weight>, std::string>;

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

    // [any thread]
    bool isSessionTrue(MorvaSessionT* session) const;
    MorvaSessionType getSessionType(MorvaSessionT* session) const;

    // Drops sessions, models and the working path. The caller holds the lock, or is alone.
    bool clearAll();

    // Registration. The caller holds the lock. Failures are reported by false and a line on
    // standard output, and change nothing.
    bool addWeightWithControlFile(wchar_t const* path, char const* modelName);
    bool addWeightBlob(char const* data, std::size_t size, char const* modelName);

    std::vector<ModelEnvironment> const& modelEnvironments() const { return modelEnvironments_; }
    std::map<std::string, unsigned long> const& modelNames() const { return modelNames_; }

    static inline std::mutex mutexForInputs_;

private:
    MorvaSessionT* createSession(MorvaSamplingRate inputRate, MorvaSamplingRate outputRate,
                                 MorvaFrameDuration duration, char const* modelName,
                                 MorvaSessionType type);

    UTILS::Path resolve(wchar_t const* path) const;
    bool isFreeName(char const* modelName) const;
    WeightAndIdentifier readAndCheckWeight(UTILS::Path const& path) const;
    WeightAndIdentifier readAndCheckWeight(char const* data, std::size_t size) const;
    WeightAndIdentifier checkWeight(std::shared_ptr<WEIGHTS::Weight> weight) const;
    std::string mvwUniqueIdGenerator(std::shared_ptr<WEIGHTS::Weight> const& weight) const;
    bool addModelEnvironment(ModelEnvironment const& environment, char const* key,
                             char const* value) const;
    bool applyControlFile(UTILS::Path const& path, ModelEnvironment const& environment,
                          std::string& identifier) const;
    bool enterModel(ModelEnvironment const& environment, std::string const& identifier,
                    char const* modelName);

    UTILS::Path workingPath_;
    std::list<std::unique_ptr<MorvaSessionT>> sessions_;
    SessionDirectory directory_;
    std::vector<ModelEnvironment> modelEnvironments_;
    std::map<std::string, unsigned long> modelNames_;  // name -> position in modelEnvironments_
    std::map<std::string, unsigned long> weightIdentities_;  // identifier -> the same
};

}  // namespace MORVA::MORVA_SDK
