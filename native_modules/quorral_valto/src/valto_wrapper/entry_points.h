// The functions that a native audio engine looks up in the loaded module. The contract is in
// quorral_valto.h; this header declares them for the module's own sources and tests.
#pragma once

#define QUORRAL_EXPORT __attribute__((visibility("default")))

extern "C" {
QUORRAL_EXPORT void* ValtoNCSetup(int samplingRate, int frameDurationMs);
QUORRAL_EXPORT int ValtoNCProcess(void* session, const short* input, unsigned int inputSize,
                                  short* output, unsigned int outputSize);
QUORRAL_EXPORT int ValtoNCReset(void* session);
QUORRAL_EXPORT void* ValtoVADSetup(int samplingRate, int frameDurationMs);
QUORRAL_EXPORT float ValtoVADProcess(void* session, const short* input, unsigned int inputSize);
QUORRAL_EXPORT int ValtoVADReset(void* session);
}
