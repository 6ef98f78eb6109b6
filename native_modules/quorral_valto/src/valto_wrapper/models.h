// The host's lists of registered models and the choice that script made among them.
//
// Thread rule: every function takes the one models lock, so any thread may call them; none belongs
// on the audio path. The globals themselves are read and written only under that lock.
#pragma once

#include <cstdint>
#include <mutex>
#include <string>
#include <vector>

#include "native/node_api/optional.h"

namespace quorral {

struct NcModel {
    std::string name;
    // Highest caller rate in hertz for which this model is picked automatically.
    std::int32_t maxSampleRate = 0;
};

// Never destroyed: an audio thread may still open sessions while the process exits.
extern std::vector<NcModel>& gNcModels;       // in registration order
extern std::string& gNcModel;                 // empty: choose by sampling rate
extern std::vector<std::string>& gVadModels;  // in registration order
extern std::string& gVadModel;                // used by new voice-activity sessions

// Serialises start-up, model choice and session set-up. Recursive: a set-up with a model of its own
// sets the choice, opens through the ordinary entry point and restores, all under one lock.
std::recursive_mutex& ModelsLock();

std::vector<std::string> NcModelNames();
std::vector<std::string> VadModelNames();

// The script's choice, else the first model that covers the rate; empty when none does.
std::string NcModelFor(int rateHz);

// False, and nothing changed, when no registered model has that name.
bool ChooseNcModel(const std::string& name);
bool ChooseVadModel(const std::string& name);
void ChooseNcModelByRate();

enum class OpenStatus { kOpen = 0, kNotInitialized = 1, kUnknownModel = 2, kRefused = 3 };

struct OpenResult {
    OpenStatus status = OpenStatus::kRefused;
    void* session = nullptr;
};

// Opens a session through the exported entry points with a model for this session alone, or with
// the script's choice when none is given.
OpenResult OpenNcSession(int rateHz, int frameMs, const Optional<std::string>& model);
OpenResult OpenVadSession(int rateHz, int frameMs, const Optional<std::string>& model);

// Lets a voice-activity model hear what a noise-cancellation session cleans.
OpenStatus EnableVoice(void* ncSession, const Optional<std::string>& model);

}  // namespace quorral
