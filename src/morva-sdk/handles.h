// From the handles that the C functions are given to the sessions behind them. [any thread]
#pragma once

#include "morva-sdk/instance.h"

namespace MORVA::MORVA_SDK {

inline constexpr char const* kWrongSession =
    "The Session pointer is wrong insert existing session pointer";
inline constexpr auto kAnyType = MorvaSessionType::Unknown;

// Throws MORVA_Exception when there is none.
inline MorvaInstanceT& engine() {
    return *MorvaInstanceT::Instance(MorvaInstanceT::MODE::get, nullptr);
}

// The live session of that type behind a handle, or null.
inline MorvaSessionT* sessionOf(void* handle, MorvaSessionType type) {
    auto const& instance = engine();
    auto* const session = static_cast<MorvaSessionT*>(handle);
    bool const matches = instance.isSessionTrue(session) &&
                         (type == kAnyType || instance.getSessionType(session) == type);
    return matches ? session : nullptr;
}

}  // namespace MORVA::MORVA_SDK
