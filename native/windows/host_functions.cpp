// The runtime's functions, found in the process that loads the module, whatever its name is.
//
// An import in the system's sense names the file that has the function ("node.exe"), and another
// host ("electron.exe") would end up with a second runtime or none. The headers declare these
// functions as imported, so every call of one goes through a pointer of a known name; the pointers
// stand here, and are filled before anything else of the module runs. The linker tells of a
// function that is missing in the list. Thread rule: the loader's, which lets one thread in.
#include <windows.h>

#include <array>

// clang-format off
#define HOST_FUNCTIONS(X)                                                                         \
    X(napi_add_env_cleanup_hook) X(napi_adjust_external_memory) X(napi_async_destroy)             \
    X(napi_async_init) X(napi_call_threadsafe_function) X(napi_close_escapable_handle_scope)      \
    X(napi_close_handle_scope) X(napi_create_array) X(napi_create_array_with_length)              \
    X(napi_create_double) X(napi_create_external) X(napi_create_function) X(napi_create_int32)    \
    X(napi_create_reference) X(napi_create_string_utf8) X(napi_create_threadsafe_function)        \
    X(napi_define_properties) X(napi_delete_reference) X(napi_escape_handle)                      \
    X(napi_fatal_exception) X(napi_get_and_clear_last_exception) X(napi_get_array_length)         \
    X(napi_get_cb_info) X(napi_get_global) X(napi_get_instance_data) X(napi_get_last_error_info)  \
    X(napi_get_property) X(napi_get_reference_value) X(napi_get_typedarray_info)                  \
    X(napi_get_undefined) X(napi_get_uv_event_loop) X(napi_get_value_bool)                        \
    X(napi_get_value_double) X(napi_get_value_external) X(napi_get_value_int32)                   \
    X(napi_get_value_string_utf8) X(napi_has_own_property) X(napi_is_array)                       \
    X(napi_is_exception_pending) X(napi_is_typedarray) X(napi_make_callback)                      \
    X(napi_module_register) X(napi_open_escapable_handle_scope) X(napi_open_handle_scope)         \
    X(napi_reference_ref) X(napi_reference_unref) X(napi_release_threadsafe_function)             \
    X(napi_remove_env_cleanup_hook) X(napi_set_element) X(napi_set_instance_data)                 \
    X(napi_set_named_property) X(napi_throw_error) X(napi_typeof)                                 \
    X(napi_unref_threadsafe_function) X(uv_async_init) X(uv_async_send) X(uv_close) X(uv_ref)     \
    X(uv_strerror) X(uv_unref)
// clang-format on

extern "C" {
#define POINTER(name) FARPROC imported_##name __asm__("__imp_" #name);
HOST_FUNCTIONS(POINTER)
#undef POINTER
}

namespace {

struct Import {
    const char* name;
    FARPROC* pointer;
};
#define ROW(name) Import{#name, &imported_##name},
constexpr std::array kImports{HOST_FUNCTIONS(ROW)};
#undef ROW

// A runtime is its process, or a library that an embedding program has under one of these names.
HMODULE Host() {
    for (const wchar_t* const name : {L"libnode.dll", L"node.dll"}) {
        if (HMODULE const library = GetModuleHandleW(name)) return library;
    }
    return GetModuleHandleW(nullptr);
}

bool Fill(HMODULE host) {
    bool all = true;
    for (const auto& [name, pointer] : kImports) {
        *pointer = GetProcAddress(host, name);
        all = all && *pointer != nullptr;
    }
    return all;
}

// In place of all where one is missing: what registers the module calls it, then the load fails.
INT_PTR WINAPI Refuse() {
    return -1;
}

struct Connection {
    bool made = Fill(Host());

    Connection() {
        for (const auto& each : kImports) {
            if (!made) *each.pointer = &Refuse;
        }
    }
};
[[gnu::init_priority(101)]] const Connection gConnection;

}  // namespace

// Resident once it is loaded: threads that loaded the module may end before others load it again.
extern "C" BOOL WINAPI DllMain(HINSTANCE module, DWORD reason, LPVOID /*reserved*/) {
    if (reason != DLL_PROCESS_ATTACH) return TRUE;
    constexpr DWORD kForGood =
        GET_MODULE_HANDLE_EX_FLAG_PIN | GET_MODULE_HANDLE_EX_FLAG_FROM_ADDRESS;
    HMODULE pinned = nullptr;
    return gConnection.made &&
           GetModuleHandleExW(kForGood, reinterpret_cast<LPCWSTR>(module), &pinned);
}
