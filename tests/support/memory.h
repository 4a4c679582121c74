/**
 * @file
 * Tests that make malloc, calloc or realloc fail.
 */
#pragma once

#ifdef __SANITIZE_ADDRESS__
/** Skips the test where a sanitizer owns the allocator. */
#define NEEDS_OWN_ALLOCATOR() GTEST_SKIP() << "the sanitizer owns the allocator: memory failures cannot be made"
#else
#define NEEDS_OWN_ALLOCATOR() static_cast<void>(0)
#endif
