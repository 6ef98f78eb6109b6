// From the handles that the C functions are given to the sessions behind them. [any thread]
#pragma once

#include "morva-sdk/instance.h"

namespace MORVA::MORVA_SDK {

inline constexpr char const* kWrongSession =
    "The Session pointer is wrong insert existing session pointer";

// Throws MORVA_Exception when there is none.
inline MorvaInstanceT& engine() {
    return *MorvaInstanceT::Instance(MorvaInstanceT::MODE::get, nullptr);
}

// The live session behind a handle, of whatever kind or of this one; or null.
inline MorvaSessionT* liveSession(void* handle) {
    auto* const session = static_cast<MorvaSessionT*>(handle);
    return engine().isSessionTrue(session) ? session : nullptr;
}
inline MorvaSessionT* liveSession(void* handle, MorvaSessionType type) {
    auto* const session = liveSession(handle);
    return session != nullptr && session->getType() == type ? session : nullptr;
}

}  // namespace MORVA::MORVA_SDK
