// The lines of module and engine for script: kept by whatever thread says them, fetched by the
// environments that listen. Nothing is printed once script has taken them.
// Thread rule: the thread of the script environment.
#pragma once

#include <node_api.h>

namespace quorral {

// takeDiagnostics(wake | null): from now on lines are kept for this environment, and `wake` is
// called on a later turn of the event loop when there are some, or they are not kept any more.
// Neither keeps the loop waiting.
napi_value TakeDiagnosticsForScript(napi_env env, napi_callback_info info);

// diagnostics(): [stream, text, stream, text, ...], in the order in which they were said.
napi_value FetchDiagnostics(napi_env env, napi_callback_info info);

}  // namespace quorral
