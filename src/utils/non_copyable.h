// Marker bases for objects that own session state and must stay where they were built.
#pragma once

namespace MORVA::UTILS {

class NonCopyable {
public:
    NonCopyable() = default;
    NonCopyable(NonCopyable const&) = delete;
    NonCopyable& operator=(NonCopyable const&) = delete;
};

class NonMovable {
public:
    NonMovable() = default;
    NonMovable(NonMovable&&) = delete;
    NonMovable& operator=(NonMovable&&) = delete;
};

class NonCopyMovable : public NonCopyable, public NonMovable {};

}  // namespace MORVA::UTILS
