// Lets engine calls in until the process ends, then turns them away.
//
// A host's audio thread may still push frames while the process's exit handlers destroy the engine.
// The gate's own exit handler runs first: it closes the gate and waits for the calls inside.
// Thread rule: Pass on any thread, two atomic operations, no lock; Arm on the control thread.
#pragma once

namespace quorral {

class ProcessGate {
public:
    // Held for the length of one engine call; false when the process is ending.
    class Pass {
    public:
        Pass();
        ~Pass();
        Pass(const Pass&) = delete;
        Pass& operator=(const Pass&) = delete;

        explicit operator bool() const { return entered_; }

    private:
        bool entered_;
    };

    // Registers the exit handler. Called once the engine exists, since handlers run in the reverse
    // order of registration; repeated calls do nothing.
    static void Arm();
};

}  // namespace quorral
