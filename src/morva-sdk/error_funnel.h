// The one way through the C interface: whatever a body throws becomes a line on standard error and
// a result, and whatever floating-point mode the caller is in, the body runs in the engine's.
// [any thread]
#pragma once

#include <exception>
#include <string>

#include "kernels/float_control.h"
#include "morva-sdk/last_error.h"
#include "utils/diagnostics.h"
#include "utils/exception.h"

namespace MORVA::MORVA_SDK {

// What a function returns for the three classes of exception.
template <class Result>
struct FailureCodes {
    Result unknown;
    Result standard;
    Result engine;
};

inline constexpr FailureCodes<int> kIntFailures{-1, -2, -3};
inline constexpr FailureCodes<float> kFloatFailures{-1.0f, -2.0f, -3.0f};
inline constexpr FailureCodes<void*> kHandleFailures{nullptr, nullptr, nullptr};

inline void printError(char const* text) noexcept {
    rememberError(text);
    UTILS::say(UTILS::Channel::error, text);
}

template <class Result, class Body>
Result funnel(FailureCodes<Result> const& codes, Body&& body) noexcept {
    UTILS::ScopedFloatControl const mode(UTILS::Denormals::kept);
    try {
        return body();
    } catch (UTILS::MORVA_Exception const& failure) {
        printError(failure.what());
        return codes.engine;
    } catch (std::exception const& failure) {
        printError(failure.what());
        return codes.standard;
    } catch (...) {
        printError("UNDEFINED EXCEPTION");
        return codes.unknown;
    }
}

}  // namespace MORVA::MORVA_SDK
