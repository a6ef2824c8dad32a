// How many blocks the C++ allocator has handed out in this program so far.
#ifndef TESTS_PLATFORM_ALLOC_COUNT_H_
#define TESTS_PLATFORM_ALLOC_COUNT_H_

#include <stddef.h>

size_t allocation_count();

#endif  // TESTS_PLATFORM_ALLOC_COUNT_H_
