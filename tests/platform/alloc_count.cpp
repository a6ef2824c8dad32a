// In a file of its own: inlined into their callers, the operators look mismatched to
// the compiler.
#include "platform/alloc_count.h"

#include <stdlib.h>

#include <atomic>
#include <new>

namespace {
std::atomic<size_t> g_allocations;
}  // namespace

size_t allocation_count() {
    return g_allocations;
}

void* operator new(size_t size, const std::nothrow_t&) noexcept {
    ++g_allocations;
    return malloc(size ? size : 1);
}
void* operator new(size_t size) {
    void* block = operator new(size, std::nothrow);
    if (!block) {
        abort();
    }
    return block;
}
void operator delete(void* block) noexcept {
    free(block);
}
void operator delete(void* block, size_t) noexcept {
    free(block);
}
