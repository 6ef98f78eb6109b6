// Makes the module known to the runtime, in both ways that runtimes look for.
//
// The static registration serves the load that maps the file. A later load (the module stays
// resident after the threads that loaded it have ended) runs no static initialiser any more; the
// runtime then finds the exported init symbol. Thread rule: the thread of the script environment
// that loads the module.
#include <node_api.h>

#include <exception>

#include "native/node_api/environment.h"
#include "native/node_api/trampoline.h"
#include "native/node_api/value.h"
#include "native_modules/quorral_valto/src/bindings/script_functions.h"
#include "native_modules/quorral_valto/src/bindings/sessions.h"

namespace quorral {
namespace {

void InstallScriptFunctions(napi_env env, napi_value exports) {
    using node_api::BindFunction;
    node_api::Environment::Initialize(env);
    const node_api::Object target(exports);
    BindFunction(target, "_initialize", Initialize);
    BindFunction(target, "_getNcModels", GetNcModels);
    BindFunction(target, "setNcModel", SetNcModel);
    BindFunction(target, "_getVadModels", GetVadModels);
    BindFunction(target, "setVadModel", SetVadModel);
}

napi_value InitializeModule(napi_env env, napi_value exports) {
    try {
        if (const napi_value sessions = RequestedSessions(env, exports)) {
            InstallSessions(env, sessions);
        } else {
            InstallScriptFunctions(env, exports);
        }
    } catch (const std::exception& failure) {
        bool pending = false;
        napi_is_exception_pending(env, &pending);
        if (!pending) napi_throw_error(env, nullptr, failure.what());
    }
    return exports;
}

napi_module gModule = {
    .nm_version = NAPI_MODULE_VERSION,
    .nm_flags = 0,
    .nm_filename = "quorral_valto.node",
    .nm_register_func = InitializeModule,
    .nm_modname = "quorral_valto",
    .nm_priv = nullptr,
    .reserved = {},
};

struct StaticRegistration {
    StaticRegistration() { napi_module_register(&gModule); }
};
const StaticRegistration kRegistration;

}  // namespace
}  // namespace quorral

NAPI_MODULE_INIT() {
    return quorral::InitializeModule(env, exports);
}
