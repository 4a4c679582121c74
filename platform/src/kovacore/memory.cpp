#include "kova/core.h"

#include <cstdlib>

void *reallocf(void *pBlock, size_t cb) {
    // realloc to nothing frees by itself in this C library, and its NULL is no failure
    if (cb == 0) {
        free(pBlock);
        return nullptr;
    }
    void *block = realloc(pBlock, cb);
    if (block == nullptr)
        free(pBlock);
    return block;
}
