/*
 * C interface of the Morva voice-processing engine: noise cancellation ("NC"), voice activity
 * ("VAD") and noise level ("NoiseDB") on short mono frames.
 *
 * Life cycle
 *   1. Morva_SDK_GlobalInit once per process;
 *   2. Morva_SDK_SetModel / Morva_SDK_SetModel_Blob for each model;
 *   3. create a session per audio stream, push frames through it, close it;
 *   4. Morva_SDK_GlobalDestroy, which also frees every session that is still open.
 *   A process may end without the last step, in the middle of a frame call too: its exit destroys
 *   nothing of the engine.
 *
 * Threads
 *   [control thread]  takes the engine's lock, allocates, prints; never call it from an audio
 *   callback.
 *   [audio thread]    takes no lock and, after the first frames, allocates nothing. One thread at
 *   a time per session; different sessions may run on different threads at the same time.
 *   Do not close a session while a frame call on it runs, nor destroy the engine while any call
 *   runs.
 *   The caller's floating-point control word is set aside for the length of every call: rounding
 *   modes and traps of the thread change no result.
 *
 * Processor
 *   Of x86-64 processors the engine needs level v3 (AVX2, FMA, F16C, BMI, LZCNT, MOVBE); on any
 *   lower Morva_SDK_GlobalInit says so on standard error and returns -3, and nothing else can be
 *   called with success.
 *
 * Errors
 *   No exception leaves this interface. Functions that return int answer with
 *      0  success
 *      1  the operation ran and reported failure (frame size or pointer wrong for the session)
 *      2  a null argument, a model that could not be registered, or a wrong session handle
 *     -1  an exception of unknown type; -2 a standard exception; -3 an engine exception
 *   and print a line on standard error that says what happened (a model that could not be
 *   registered, and a null argument there, on standard output).
 *
 * Paths
 *   are wide strings: code points where wchar_t has 32 bits, UTF-16 on Windows. There "\" and "/"
 *   separate, and "C:\", "\\server\share\" and "\\?\C:\" begin a path that is not relative.
 *
 * Frames
 *   A frame holds rate * duration / 1000 samples (truncated; 441 for 44100 Hz and 10 ms). Sizes are
 *   counts of samples. Integer samples use the whole 16-bit range; float samples lie in -1..1 and
 *   are limited to that range (float output lies in -1..0.999969482421875). A sample that is no
 *   sound (a NaN, an infinity) counts as 0, so that a bad frame is like a frame of silence: nothing
 *   of it stays in the session. Input and output may be the same buffer.
 */
#ifndef MORVA_SDK_H
#define MORVA_SDK_H

#ifndef __cplusplus
#include <wchar.h>
#endif

#if defined(__GNUC__)
#define MORVA_API __attribute__((visibility("default")))
#else
#define MORVA_API
#endif

/* Enumerations cross the interface as plain 32-bit integers. */
#ifdef __cplusplus
#define MORVA_ENUM(name) enum name : int
extern "C" {
#else
#define MORVA_ENUM(name) enum name
#endif

/* What the engine takes, as lists: sampling rates in hertz and frame lengths in milliseconds,
 * nothing between them. X(value) is expanded for each, ascending. */
#define MORVA_SAMPLING_RATES(X) \
    X(8000) X(12000) X(16000) X(24000) X(32000) X(44100) X(48000) X(88200) X(96000)
#define MORVA_FRAME_DURATIONS(X) X(10) X(20) X(30) X(40)

/* MORVA_RATE_8000 = 8000 ... MORVA_RATE_96000 = 96000 */
#define MORVA_RATE_ENTRY(hz) MORVA_RATE_##hz = (hz),
typedef MORVA_ENUM(MorvaSamplingRate){MORVA_SAMPLING_RATES(MORVA_RATE_ENTRY)} MorvaSamplingRate;
#undef MORVA_RATE_ENTRY

/* MORVA_FRAME_10_MS = 10 ... MORVA_FRAME_40_MS = 40 */
#define MORVA_FRAME_ENTRY(ms) MORVA_FRAME_##ms##_MS = (ms),
typedef MORVA_ENUM(MorvaFrameDuration){MORVA_FRAME_DURATIONS(MORVA_FRAME_ENTRY)} MorvaFrameDuration;
#undef MORVA_FRAME_ENTRY

/* [control thread] Creates the engine. Relative model paths are resolved against `workingPath` (may
 * be null: no prefix). A `threads` of 1..8 is passed on to the math library; the sequential layer
 * that the engine links runs on the calling thread whatever the count. -3 when the engine exists
 * already. */
MORVA_API int Morva_SDK_GlobalInit(wchar_t const* workingPath, unsigned int threads);

/* [control thread] Frees the engine, its models and all open sessions. -3 when there is none. */
MORVA_API int Morva_SDK_GlobalDestroy(void);

/* [control thread] Registers a model under a name of your choice, from a weight file ("mvw") or a
 * control file ("cfg": lines of key and value; WEIGHT names the weight file, every other key is a
 * model parameter). 0 when registered, 2 when not (reason on standard output). */
MORVA_API int Morva_SDK_SetModel(wchar_t const* weightPath, char const* modelName);

/* [control thread] The same from the bytes of a weight file in memory; the bytes are copied. */
MORVA_API int Morva_SDK_SetModel_Blob(char const* weightBytes, unsigned int size,
                                      char const* modelName);

/* [control thread] Open a session; null on failure. With a null `modelName` the engine takes the
 * registered model of the highest rate that is not above the input rate. */
MORVA_API void* Morva_NC_CreateSession(MorvaSamplingRate inputRate, MorvaSamplingRate outputRate,
                                       MorvaFrameDuration duration, char const* modelName);
MORVA_API void* Morva_VAD_CreateSession(MorvaSamplingRate rate, MorvaFrameDuration duration,
                                        char const* modelName);
MORVA_API void* Morva_NoiseDB_CreateSession(MorvaSamplingRate rate, MorvaFrameDuration duration,
                                            char const* modelName);

/* [control thread] Close a session of that kind; -3 for an unknown handle or another kind. */
MORVA_API int Morva_NC_CloseSession(void* session);
MORVA_API int Morva_VAD_CloseSession(void* session);
MORVA_API int Morva_NoiseDB_CloseSession(void* session);

/* [the session's thread, between frames] Brings a noise-level session back to its start: the same
 * input then gives bit-equal results again. Returns 1 (one) on success, -3 for a wrong handle. */
MORVA_API int Morva_NoiseDB_ResetSession(void* session);

/* [audio thread] Clean one frame. `inputSize` is the frame size at the input rate, `outputSize` at
 * the output rate; anything else is refused with 1 and changes nothing. 2 for a wrong handle. */
MORVA_API int Morva_NC_CleanAmbientNoiseInt16(void* session, short const* input,
                                              unsigned int inputSize, short* output,
                                              unsigned int outputSize);
MORVA_API int Morva_NC_CleanAmbientNoiseFloat(void* session, float const* input,
                                              unsigned int inputSize, float* output,
                                              unsigned int outputSize);

/* [audio thread] Voice score of one frame, 0..1 for a calibrated model. Negative on failure: -1.0
 * an exception of unknown type, -2.0 a standard exception, -3.0 an engine exception (Int16: also a
 * wrong frame size), -4.0 a wrong handle (Float: also a wrong frame size, and any result outside
 * 0..1). */
MORVA_API float Morva_VAD_FrameInt16(void* session, short const* input, unsigned int inputSize);
MORVA_API float Morva_VAD_FrameFloat(void* session, float const* input, unsigned int inputSize);

/* [audio thread] Noise level after one frame, in decibels re one squared unit of the 16-bit sample
 * scale: -60 for silence, about 90.3 for a full-scale square wave. Errors of the Int16 call as
 * above (a level equal to one of those codes cannot be told from it). The Float call answers only
 * levels within 0..1 dB; every other level is refused like a wrong handle: "THE CLEANING ERROR
 * OUTPUT result <level>" and the wrong-session line are printed and -4.0 returned, while the
 * session goes on as usual. MorvaExt_NoiseDB_FrameFloat (morva-ext.h) gives every level. */
MORVA_API float Morva_NoiseDB_FrameInt16(void* session, short const* input, unsigned int inputSize);
MORVA_API float Morva_NoiseDB_FrameFloat(void* session, float const* input, unsigned int inputSize);

#ifdef __cplusplus
}
#endif

#endif /* MORVA_SDK_H */
