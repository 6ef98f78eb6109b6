// The operators that allocate, for libraries linked by Zig, which exports those of its C++ library:
// other libraries of a process would take them for replacements of their own. These are hidden (see
// morva_export).
#include <algorithm>
#include <cstdlib>
#include <new>

namespace {

void* allocated(std::size_t size, std::align_val_t alignment) {
    for (;;) {
        void* block = nullptr;
        if (posix_memalign(&block, std::max(sizeof block, std::size_t(alignment)), size) == 0)
            return block;
        auto const handler = std::get_new_handler();
        if (handler == nullptr) throw std::bad_alloc();
        handler();
    }
}

}  // namespace

// clang-format off
using Size = std::size_t;
using Alignment = std::align_val_t;
constexpr Alignment usual{__STDCPP_DEFAULT_NEW_ALIGNMENT__};

void* operator new(Size size) { return allocated(size, usual); }
void* operator new[](Size size) { return allocated(size, usual); }
void* operator new(Size size, Alignment alignment) { return allocated(size, alignment); }
void* operator new[](Size size, Alignment alignment) { return allocated(size, alignment); }
void operator delete(void* block) noexcept { std::free(block); }
void operator delete[](void* block) noexcept { std::free(block); }
void operator delete(void* block, Size) noexcept { std::free(block); }
void operator delete[](void* block, Size) noexcept { std::free(block); }
void operator delete(void* block, Alignment) noexcept { std::free(block); }
void operator delete[](void* block, Alignment) noexcept { std::free(block); }
void operator delete(void* block, Size, Alignment) noexcept { std::free(block); }
void operator delete[](void* block, Size, Alignment) noexcept { std::free(block); }
// clang-format on
