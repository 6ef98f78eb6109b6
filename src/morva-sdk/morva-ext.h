/*
 * Additions to the C interface (morva-sdk.h): what integrators ask for beyond the given functions,
 * whose behaviour is untouched. Errors are reported as there.
 */
#ifndef MORVA_EXT_H
#define MORVA_EXT_H

#include "morva-sdk.h"

#ifdef __cplusplus
extern "C" {
#endif

/* [control thread] From sound in to sound out of a noise-cancellation session, in samples at its
 * output rate, rounded: the model's pipeline delay and the filter delay of each resampler that
 * runs. It is constant for the session's life. -3 for any other handle or without an engine. */
MORVA_API int MorvaExt_SessionLatencySamples(void* session);

/* [control thread] Samples per frame that a session of any kind takes and gives (0 output samples
 * for voice activity). Either pointer may be null. 0 on success, 2 for a wrong handle, -3 without
 * an engine. */
MORVA_API int MorvaExt_SessionFrameSizes(void* session, unsigned int* inputSize,
                                         unsigned int* outputSize);

/* [audio thread] Noise level after one float frame, in decibels as Morva_NoiseDB_FrameInt16 reports
 * it, into `levelDb`. 0 on success; 1 for a wrong frame size or null pointer; 2 for a wrong handle;
 * -1 to -3 as in morva-sdk.h. */
MORVA_API int MorvaExt_NoiseDB_FrameFloat(void* session, float const* input, unsigned int inputSize,
                                          float* levelDb);

#ifdef __cplusplus
}
#endif

#endif /* MORVA_EXT_H */
