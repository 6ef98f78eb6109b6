/* Entry points of quorral_valto.node for an audio engine in the same process.
 *
 * Look the functions up in the loaded module: dlopen(path, RTLD_NOW | RTLD_NOLOAD), then dlsym.
 * Script code must have initialised the module first. Audio is 16-bit signed mono PCM; a frame has
 * rate * durationMs / 1000 samples.
 *
 * Threads: Setup and Reset take locks and may print, keep them off the audio path. Process takes no
 * lock, but for a moment to tell of a frame that it refuses. What is printed goes to script instead
 * once the package's initialize() has run. One session belongs to one thread at a time; different
 * sessions may run on different threads. They may go on while the process ends: nothing that they
 * need is destroyed then.
 */
#ifndef QUORRAL_VALTO_H
#define QUORRAL_VALTO_H

#ifdef __cplusplus
extern "C" {
#endif

/* [control thread] Opens a noise-cancellation session; null on failure. Rates in hertz: 8000,
 * 12000, 16000, 24000, 32000, 44100, 48000, 88200, 96000 (another one is replaced by 16000, with a
 * printed line). Durations in milliseconds: 10, 20, 30, 40 (15 and 32 fail, others become 10, with
 * a printed line). Model: the one that script chose, otherwise the first that covers the rate. */
typedef void* (*ValtoNCSetupFn)(int samplingRate, int frameDurationMs);

/* [audio thread] Cleans one frame; input and output may be the same buffer. Sizes in samples, both
 * equal to the session's frame. 0 success, 1 a wrong size or null buffer, 2 not an open
 * noise-cancellation session, -1 to -3 an engine failure (its text is on standard error). */
typedef int (*ValtoNCProcessFn)(void* session, const short* input, unsigned int inputSize,
                                short* output, unsigned int outputSize);

/* [control thread] Closes the session: 0, or -3 for a handle that is not open. */
typedef int (*ValtoNCResetFn)(void* session);

/* [control thread] Opens a voice-activity session with the voice-activity model chosen by script.
 */
typedef void* (*ValtoVADSetupFn)(int samplingRate, int frameDurationMs);

/* [audio thread] Probability 0..1 that the frame holds voice; -3 a wrong size or null buffer (other
 * engine failures: -1, -2), -4 not an open voice-activity session. */
typedef float (*ValtoVADProcessFn)(void* session, const short* input, unsigned int inputSize);

/* [control thread] Closes the session: 0, or -3 for a handle that is not open. */
typedef int (*ValtoVADResetFn)(void* session);

#ifdef __cplusplus
}
#endif

#endif
