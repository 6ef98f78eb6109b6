// Start-up in the order of the printed codes: processor, engine, weight files.
#include "native_modules/quorral_valto/src/valto_wrapper/valto_wrapper.h"

#include <array>
#include <cstdint>
#include <cstdio>
#include <exception>
#include <mutex>
#include <new>
#include <string>

#include "morva-sdk/morva-sdk.h"
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

struct ShippedNcModel {
    const wchar_t* file;
    const char* name;
    std::int32_t maxSampleRate;
};

constexpr std::array kShippedNcModels{
    ShippedNcModel{L"./NC_small_8k.mvw", "small_NC_8k", 8000},
    ShippedNcModel{L"./NC_small_16k.mvw", "small_NC", 16000},
    ShippedNcModel{L"./c6.xs.f.ca03f4.mvw", "full_NC-ca03f4", 96000},
};
constexpr const wchar_t* kShippedVadFile = L"./VAD_weight.mvw";
constexpr const char* kShippedVadModel = "default_VAD";

Optional<int> gInitializeResult;

void PrintLine(const char* line) {
    std::puts(line);
    std::fflush(stdout);
}

bool RegisterWeight(const wchar_t* file, const std::string& name, const std::string& directory) {
    if (Morva_SDK_SetModel(file, name.c_str()) == 0) return true;
    std::printf("Failed to load Morva weight file: %s with working directory: %s\n",
                util::ToUTF8(file).c_str(), directory.c_str());
    std::fflush(stdout);
    return false;
}

// The result of the registration; the engine exists when this is called. The code counts down with
// the rows, so it also names the row at which memory ran out.
int RegisterShippedModels(const std::string& directory) {
    int code = kFirstWeightMissing;
    try {
        for (const auto& shipped : kShippedNcModels) {
            if (!RegisterWeight(shipped.file, shipped.name, directory)) return code;
            gNcModels.push_back({.name = shipped.name, .maxSampleRate = shipped.maxSampleRate});
            --code;
        }
        gVadModel = kShippedVadModel;
        if (!RegisterWeight(kShippedVadFile, gVadModel, directory)) return code;
        gVadModels.push_back(gVadModel);
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
        PrintLine("Failed to initialize Morva SDK: CPU does not support SSE 4.1");
        return kNoSse41;
    }
    if (!features.avx2) {
        PrintLine("Failed to initialize Morva SDK: CPU does not support AVX2");
        return kNoAvx2;
    }
    std::string directory;
    if (!CreateEngine(directory)) {
        PrintLine("Faild to initialize Morva SDK");
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
