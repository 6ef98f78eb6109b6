// Which session handles are live, answered without a lock. Audio threads ask while a control thread
// opens and closes other sessions: slots are atomic pointers in chunks that are only ever added, so
// a reader walks them at any time.
#pragma once

#include <array>
#include <atomic>
#include <cstddef>
#include <memory>

namespace MORVA::MORVA_SDK {

class MorvaSessionT;

class SessionDirectory {
public:
    ~SessionDirectory();

    // [control thread] Under the engine's lock. `add` may allocate a chunk.
    void add(MorvaSessionT* session);
    void remove(MorvaSessionT const* session);

    // [any thread]
    bool contains(void const* session) const;

private:
    struct Chunk {
        std::array<std::atomic<MorvaSessionT*>, 64> slots{};
        std::atomic<Chunk*> next{nullptr};
    };

    Chunk first_;
};

}  // namespace MORVA::MORVA_SDK
