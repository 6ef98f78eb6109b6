#include "morva-sdk/session_directory.h"

#include <algorithm>

namespace MORVA::MORVA_SDK {
namespace {

// The slot of `chunk` that holds `session`, or null.
template <class Chunk>
auto slotOf(Chunk& chunk, void const* session) {
    auto const slot = std::find_if(chunk.slots.begin(), chunk.slots.end(), [&](auto const& held) {
        return held.load(std::memory_order_acquire) == session;
    });
    return slot == chunk.slots.end() ? nullptr : &*slot;
}

}  // namespace

SessionDirectory::~SessionDirectory() {
    for (Chunk* chunk = first_.next.load(); chunk != nullptr;) {
        std::unique_ptr<Chunk> const owned(chunk);
        chunk = owned->next.load();
    }
}

void SessionDirectory::add(MorvaSessionT* session) {
    Chunk* chunk = &first_;
    while (true) {
        if (auto* const free = slotOf(*chunk, nullptr)) {
            free->store(session, std::memory_order_release);
            return;
        }
        if (chunk->next.load() == nullptr) chunk->next.store(std::make_unique<Chunk>().release());
        chunk = chunk->next.load();
    }
}

void SessionDirectory::remove(MorvaSessionT const* session) {
    for (Chunk* chunk = &first_; chunk != nullptr; chunk = chunk->next.load()) {
        if (auto* const slot = slotOf(*chunk, session)) {
            slot->store(nullptr, std::memory_order_release);
            return;
        }
    }
}

bool SessionDirectory::contains(void const* session) const {
    if (session == nullptr) return false;
    for (Chunk const* chunk = &first_; chunk != nullptr;
         chunk = chunk->next.load(std::memory_order_acquire)) {
        if (slotOf(*chunk, session) != nullptr) return true;
    }
    return false;
}

}  // namespace MORVA::MORVA_SDK
