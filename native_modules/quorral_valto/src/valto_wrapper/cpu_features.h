// What the processor must offer before the engine's vector code may run.
// Thread rule: any thread. This unit must stay runnable on every x86-64 processor.
#pragma once

namespace quorral {

struct CpuFeatures {
    bool sse41 = false;
    bool avx2 = false;
};

// The query is a parameter of the start-up so that tests can pretend to be an old processor.
using CpuFeatureQuery = CpuFeatures (*)();

CpuFeatures QueryCpuFeatures();

}  // namespace quorral
