/**
 * @file
 * Whether memory failures can be made here: a sanitizer and valgrind bring an allocator of their own.
 */
#pragma once

namespace kova_test {

/** Whether malloc and its siblings are the rig's. */
bool owns_allocator();

} // namespace kova_test

/** Skips a test that makes malloc, calloc or realloc fail where that is impossible. */
#define NEEDS_OWN_ALLOCATOR()                                                                                          \
    if (!::kova_test::owns_allocator())                                                                                \
    GTEST_SKIP() << "the allocator of a checking tool stands in: memory failures cannot be made"
