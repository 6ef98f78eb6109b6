// Start-up in the order of the printed codes: processor, engine, weight files.
#include "native_modules/quorral_valto/src/valto_wrapper/valto_wrapper.h"

#include <exception>
#include <mutex>
#include <new>
#include <string>

#include "morva-sdk/morva-sdk.h"
#include "native_modules/quorral_valto/src/valto_wrapper/diagnostics.h"
#include "native_modules/quorral_valto/src/valto_wrapper/models.h"
#include "native_modules/quorral_valto/src/valto_wrapper/util.h"

namespace quorral {
namespace {

constexpr int kNoSse41 = -1;
constexpr int kNoAvx2 = -2;
constexpr int kNoEngine = -4;
constexpr int kFirstWeightMissing = -5;

// The engine runs one thread of the math library per call.
constexpr unsigned kEngineThreads = 1;

Optional<int> gInitializeResult;

bool RegisterWeight(const std::wstring& file, const std::string& name,
                    const std::string& directory) {
    if (Morva_SDK_SetModel(file.c_str(), name.c_str()) == 0) return true;
    Say("Failed to load Morva weight file: " + util::ToUTF8(file) +
        " with working directory: " + directory);
    return false;
}

bool Register(const morva::ShippedModel& model, const std::string& directory) {
    const bool isVad = model.kind == morva::ShippedKind::VAD;
    if (isVad) gVadModel = model.name;
    const std::wstring file = util::ToUTF16(std::string("./") + model.file);
    if (!RegisterWeight(file, model.name, directory)) return false;
    if (isVad) {
        gVadModels.emplace_back(model.name);
    } else {
        gNcModels.push_back({.name = model.name, .maxSampleRate = model.maxRateHz});
    }
    return true;
}

// The result of the registration; the engine exists when this is called. The code counts down with
// the rows, so it also names the row at which memory ran out.
int RegisterShippedModels(const std::string& directory) {
    int code = kFirstWeightMissing;
    try {
        for (const auto& model : morva::shippedModels) {
            if (!IsHosted(model)) continue;
            if (!Register(model, directory)) return code;
            --code;
        }
    } catch (const std::bad_alloc&) {
        return code;
    }
    return 0;
}

// Puts the working directory into `directory`.
bool CreateEngine(std::string& directory) {
    try {
        directory = util::ModuleBasePath();
        return Morva_SDK_GlobalInit(util::ToUTF16(directory).c_str(), kEngineThreads) == 0;
    } catch (const std::exception&) {
        return false;  // no memory, or a directory whose name is not UTF-8
    }
}

}  // namespace

int ValtoInitialize() {
    return ValtoInitialize(QueryCpuFeatures);
}

int ValtoInitialize(CpuFeatureQuery query) {
    const std::lock_guard guard(ModelsLock());
    const CpuFeatures features = query();
    if (!features.sse41) {
        Say("Failed to initialize Morva SDK: CPU does not support SSE 4.1");
        return kNoSse41;
    }
    if (!features.avx2) {
        Say("Failed to initialize Morva SDK: CPU does not support AVX2");
        return kNoAvx2;
    }
    std::string directory;
    if (!CreateEngine(directory)) {
        Say("Faild to initialize Morva SDK");
        return kNoEngine;
    }
    gInitializeResult = RegisterShippedModels(directory);
    return *gInitializeResult;
}

Optional<int> InitializeResult() {
    const std::lock_guard guard(ModelsLock());
    return gInitializeResult;
}

int EnsureInitialized() {
    const std::lock_guard guard(ModelsLock());
    return gInitializeResult ? *gInitializeResult : ValtoInitialize();
}

}  // namespace quorral
