#include "native_modules/quorral_valto/src/bindings/diagnostics.h"

#include <atomic>
#include <cstdint>
#include <exception>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

#include "native_modules/quorral_valto/src/valto_wrapper/diagnostics.h"

namespace quorral {
namespace {

struct Line {
    int stream;
    std::string text;
};

// One environment that listens. Nobody calls `wake` once the box is out of the list.
struct Mailbox {
    napi_env env = nullptr;
    napi_threadsafe_function wake = nullptr;
    std::vector<Line> lines;
};

struct Mailboxes {
    std::mutex lock;
    std::vector<std::unique_ptr<Mailbox>> boxes;
    std::atomic<bool> any = false;  // says the same without the lock

    Mailbox* Of(napi_env env) {
        for (const auto& box : boxes) {
            if (box->env == env) return box.get();
        }
        return nullptr;
    }
};

// Never destroyed: audio threads may speak while the process exits.
Mailboxes& All() {
    static Mailboxes& all = *std::make_unique<Mailboxes>().release();
    return all;
}

// Any thread.
void Keep(int stream, const char* text) noexcept {
    Mailboxes& all = All();
    if (!all.any) return;
    try {
        const std::lock_guard guard(all.lock);
        for (const auto& box : all.boxes) {
            box->lines.push_back({.stream = stream, .text = text});
            if (box->lines.size() == 1) {
                napi_call_threadsafe_function(box->wake, nullptr, napi_tsfn_nonblocking);
            }
        }
    } catch (const std::exception&) {  // no memory for it
    }
}

void StopListening(void* env) {
    Mailboxes& all = All();
    const std::lock_guard guard(all.lock);
    std::erase_if(all.boxes, [env](const auto& box) {
        if (box->env != env) return false;
        napi_release_threadsafe_function(box->wake, napi_tsfn_abort);
        return true;
    });
    all.any = !all.boxes.empty();
}

bool Listens(napi_env env) {
    const std::lock_guard guard(All().lock);
    return All().Of(env) != nullptr;
}

bool Listen(napi_env env, napi_value function) {
    auto box = std::make_unique<Mailbox>();
    box->env = env;
    napi_value name = nullptr;
    if (napi_create_string_utf8(env, "diagnostics", NAPI_AUTO_LENGTH, &name) != napi_ok ||
        napi_create_threadsafe_function(env, function, nullptr, name, 0, 1, nullptr, nullptr,
                                        nullptr, nullptr, &box->wake) != napi_ok) {
        return false;
    }
    napi_unref_threadsafe_function(env, box->wake);
    // Hooks run last in, first out: this one before the function's own.
    napi_add_env_cleanup_hook(env, StopListening, env);
    Mailboxes& all = All();
    const std::lock_guard guard(all.lock);
    all.boxes.push_back(std::move(box));
    all.any = true;
    return true;
}

napi_value ArrayOf(napi_env env, const std::vector<Line>& lines) {
    napi_value array = nullptr;
    napi_create_array(env, &array);
    std::uint32_t index = 0;
    for (const auto& [stream, text] : lines) {
        napi_value value = nullptr;
        napi_create_int32(env, stream, &value);
        napi_set_element(env, array, index++, value);
        napi_create_string_utf8(env, text.data(), text.size(), &value);
        napi_set_element(env, array, index++, value);
    }
    return array;
}

}  // namespace

napi_value TakeDiagnosticsForScript(napi_env env, napi_callback_info info) {
    napi_value function = nullptr;
    std::size_t count = 1;
    napi_get_cb_info(env, info, &count, &function, nullptr, nullptr);
    napi_valuetype type = napi_undefined;
    napi_typeof(env, function, &type);
    try {
        TakeDiagnostics(Keep);
        if (Listens(env)) {
            napi_remove_env_cleanup_hook(env, StopListening, env);
            StopListening(env);
        }
        if (type == napi_function && !Listen(env, function)) {
            napi_throw_error(env, nullptr, "The runtime offers no way to deliver diagnostics");
        }
    } catch (const std::exception& failure) {
        napi_throw_error(env, nullptr, failure.what());
    }
    return nullptr;
}

napi_value FetchDiagnostics(napi_env env, napi_callback_info /*info*/) {
    std::vector<Line> lines;
    {
        Mailboxes& all = All();
        const std::lock_guard guard(all.lock);
        if (Mailbox* const box = all.Of(env)) lines.swap(box->lines);
    }
    return ArrayOf(env, lines);
}

}  // namespace quorral
