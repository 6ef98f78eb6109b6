// Lets engine calls in until the process ends, then turns them away.
//
// A host's audio thread may still push frames while the process's exit handlers destroy the engine
// and the caches under it. No object of this module is destroyed before the gate is closed and the
// calls inside have come back, or two seconds have passed (exit_order.cpp).
// Thread rule: any thread. Pass: two atomic operations, no lock. Close: waits.
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

    // Closes the gate for good; the first call waits for the calls inside, two seconds at most.
    static void Close();
};

}  // namespace quorral
