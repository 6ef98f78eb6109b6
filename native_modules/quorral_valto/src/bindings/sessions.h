// The module's second export object: sessions for script code that has audio in script.
//
// A plain require() fills the exports with the five script functions and nothing else. A loader
// that wants sessions loads the same file with process.dlopen and an exports object that has a
// property `sessions` holding an object; the module then fills that object instead:
//   initialize(): number                        start-up code; an engine that is already up answers
//                                               with the code of its own start-up
//   openNc(rateHz, frameMs, model | null)       a session, or 1 (not initialised), 2 (unknown
//                                               model), 3 (refused by the engine)
//   openVad(rateHz, frameMs, model | null)      the same
//   processNc(session, input, output): number   the engine's code; two Int16Array or Float32Array
//   processVad(session, input): number          the voice score, negative on failure
// of a noise-cancellation session:
//   latency(session): number                    delay in samples
//   setAttenuationLimit(session, dB): number    the engine's code
//   setBypass(session, on): number              the same
//   enableVoice(session, model | null): number  0, or 2 and 3 as above
//   voiceScore(session): number                 of the last frame; NaN unless enabled
//   noiseLevel(session): number                 likewise, in decibels
// and:
//   lastError(): string                         of this thread, as the engine told it
//   takeDiagnostics(wake | null), diagnostics() what is said, see diagnostics.h
//   close(session): undefined                   repeated calls do nothing
//   weightFiles: string[]                       in the order of the start-up codes from -5 down
// These are for the package's own loader, which checks arguments and words the errors.
// Thread rule: the thread of the script environment; a session belongs to the environment that
// opened it. A session that script has forgotten is closed on the turn of the event loop after its
// collection, or when the next one is opened.
#pragma once

#include <node_api.h>

namespace quorral {

// The object to fill, or null when these exports ask for the script functions.
napi_value RequestedSessions(napi_env env, napi_value exports);
// Throws std::runtime_error when the runtime refuses.
void InstallSessions(napi_env env, napi_value target);

}  // namespace quorral
