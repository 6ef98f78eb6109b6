/*
 * Additions to the C interface (morva-sdk.h): what integrators ask for beyond the given functions,
 * whose behaviour is untouched. Threads and error codes as there: 0 success, 1 the model or session
 * cannot do that, 2 a null argument or a wrong handle, -1 to -3 exceptions (-3 also without an
 * engine).
 */
#ifndef MORVA_EXT_H
#define MORVA_EXT_H

#include "morva-sdk.h"

#ifdef __cplusplus
extern "C" {
#endif

/* ---- what a session is ---- */

/* [any thread] From sound in to sound out of a noise-cancellation session, in samples at its output
 * rate, rounded: the model's pipeline delay and the filter delay of each resampler that runs.
 * Constant for the session's life, bypass included. Negative for any other handle. */
MORVA_API int MorvaExt_SessionLatencySamples(void* session);

/* [any thread] The same of the cleaned sound, not rounded, into `samples`; bypass keeps to the
 * rounded one. */
MORVA_API int MorvaExt_SessionExactLatency(void* session, double* samples);

/* [any thread] Samples per frame that a session of any kind takes and gives (0 output samples for
 * voice activity). Either pointer may be null. */
MORVA_API int MorvaExt_SessionFrameSizes(void* session, unsigned int* inputSize,
                                         unsigned int* outputSize);

/* ---- noise-cancellation sessions while they run ---- */

/* [any thread] Attenuation limit: within the model's band no part of the sound is lowered by more
 * than `limitDb` decibels (what lies above the band is lost at any limit; see bypass).
 * 0 lets everything through (delayed), INFINITY is no limit and the default. It is a floor under
 * the mask, so speech and the noise that is left keep one phase; a change fades in over a model
 * hop. 1 for a negative limit or a NaN. Stages after the mask (background speaker, limiter, output
 * gain of a model) act on what it leaves. */
MORVA_API int MorvaExt_NC_SetAttenuationLimit(void* session, float limitDb);

/* [any thread] Bypass: non-zero gives the caller's own sound at the session's latency, across the
 * whole band; the change cross-fades over one frame. The model goes on listening, so switching back
 * is seamless. */
MORVA_API int MorvaExt_NC_SetBypass(void* session, int on);

/* [any thread] Background-speaker stage on or off; 1 when the model has none. */
MORVA_API int MorvaExt_NC_SetBackgroundSpeaker(void* session, int on);

/* [control thread] Lets the voice-activity model `vadModel` (null: chosen by rate) judge every
 * frame that this session cleans, from the next one on, which allocates nothing either. Not while a
 * frame call runs on it. -3 when the model cannot be opened; the session then goes on as it was. */
MORVA_API int MorvaExt_NC_EnableVoice(void* session, char const* vadModel);

/* [audio thread] Meters of the last cleaned frame: the voice score (NaN unless enabled) and the
 * level of what was removed, in decibels as noise-level sessions report it (with an attenuation
 * limit, of the part that was removed). A model of version NC_1.0.0 says both by itself: its own
 * score until another model is enabled, and the level of the noise whatever the limit. Either
 * pointer may be null. */
MORVA_API int MorvaExt_NC_FrameMeters(void* session, float* voice, float* noiseDb);

/* ---- noise level ---- */

/* [audio thread] Noise level after one float frame, as Morva_NoiseDB_FrameInt16 reports it, into
 * `levelDb`. 1 for a wrong frame size. */
MORVA_API int MorvaExt_NoiseDB_FrameFloat(void* session, float const* input, unsigned int inputSize,
                                          float* levelDb);

/* ---- engine ---- */

typedef struct MorvaExtModelInfo {
    char name[128];          /* as registered, cut to fit */
    char version[32];        /* of the weight: which model class runs it; empty when it has none */
    int sampleRate;          /* hertz; 0 when the weight does not say */
    int frameMs;             /* model frame, milliseconds; 0 likewise */
    unsigned long long size; /* bytes of numbers in the weight */
} MorvaExtModelInfo;

/* [control thread] The registered models, by name in byte order. Writes at most `capacity` of them
 * to `models` (null allowed with 0) and returns how many there are; negative on failure. */
MORVA_API int MorvaExt_ListModels(MorvaExtModelInfo* models, int capacity);

/* [any thread] "major.minor.patch" of this library. */
MORVA_API char const* MorvaExt_Version(void);

/* [any thread] The processor's features that matter here, blank-separated: "sse4.1 avx2 fma bmi2
 * avx512f", "neon" or "simd128". */
MORVA_API char const* MorvaExt_ProcessorFeatures(void);

/* One diagnostic: `stream` 1 or 2, where it would be printed (standard output, standard error), and
 * its text without the last line break; a text may have several lines. */
typedef void (*MorvaExtDiagnostic)(int stream, char const* text);

/* [any thread, with or without an engine] Hands everything that the engine would print in this
 * process to `take`; null prints again, which is the default. `take` runs on the thread whose call
 * has something to say, several at a time: control threads hold the engine's lock meanwhile, and an
 * audio thread comes with a refused frame. So it calls nothing of this interface but
 * MorvaExt_LastError, does not wait, throws nothing, and stays callable, since another thread may
 * still be inside when this returns. A frame that succeeds says nothing. */
MORVA_API void MorvaExt_SetDiagnostics(MorvaExtDiagnostic take);

/* [any thread] Text of the last failure that a call on this thread told (on standard error, unless
 * somebody takes it); empty when there was none. Valid until the thread's next failure. */
MORVA_API char const* MorvaExt_LastError(void);

#ifdef __cplusplus
}
#endif

#endif /* MORVA_EXT_H */
