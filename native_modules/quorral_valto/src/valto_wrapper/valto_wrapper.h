// Start-up: checks the processor, creates the engine, registers the models that lie beside the
// module. Thread rule: control threads; serialised by the models lock.
#pragma once

#include "native/node_api/optional.h"
#include "native_modules/quorral_valto/src/valto_wrapper/cpu_features.h"
#include "shipped_models.h"

namespace quorral {

// Which of the shipped models a host is offered.
constexpr bool IsHosted(const morva::ShippedModel& model) {
    return model.kind != morva::ShippedKind::NoiseDB;
}

// 0 on success; -1 no SSE 4.1, -2 no AVX2, -4 the engine cannot be created (or exists already),
// -5 to -8 the first to fourth hosted model cannot be registered. Each failure but a lack of memory
// prints one line on standard output. What was registered before a failure stays.
int ValtoInitialize();
int ValtoInitialize(CpuFeatureQuery query);

// The code that the start-up which created the engine returned; nothing while there is no engine.
Optional<int> InitializeResult();

// Like ValtoInitialize, but an engine that exists already answers with the code of its own
// start-up.
int EnsureInitialized();

}  // namespace quorral
