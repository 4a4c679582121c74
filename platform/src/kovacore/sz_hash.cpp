#include "kovacore/sz_hash.h"

#include <cstring>
#include <utility>

#include "common/fnv.h"
#include "common/guard.h"
#include "common/report.h"

using namespace kova;

/** Entries in order, and a table of entry numbers plus one (0: free), probed one after the other, at most half full. */
struct KLIBSZHASH {
    hash_entry *entries;
    uint32_t *slots;
    uint32_t count;
    uint32_t capacity;
    uint32_t slot_mask;
};

namespace {

uint32_t *find_slot(const KLIBSZHASH *hash, const char *key) {
    auto at = static_cast<uint32_t>(fnv1a(key));
    while (true) {
        uint32_t *slot = &hash->slots[at++ & hash->slot_mask];
        if (*slot == 0 || strcmp(hash->entries[*slot - 1].key, key) == 0)
            return slot;
    }
}

/** Makes room for so many entries; the map is as before when memory runs out. */
bool make_room(KLIBSZHASH *hash, uint32_t capacity) {
    if (capacity > UINT32_MAX / 4)
        return false;
    uint32_t slot_count = 16;
    while (slot_count < capacity * 2)
        slot_count *= 2;
    heap_ptr<uint32_t> slots{static_cast<uint32_t *>(calloc(slot_count, sizeof(uint32_t)))};
    if (!slots)
        return false;
    void *entries = reallocarray(hash->entries, capacity, sizeof(hash_entry));
    if (entries == nullptr)
        return false;

    hash->entries = static_cast<hash_entry *>(entries);
    hash->capacity = capacity;
    free(hash->slots);
    hash->slots = slots.release();
    hash->slot_mask = slot_count - 1;
    for (uint32_t i = 0; i < hash->count; i++)
        *find_slot(hash, hash->entries[i].key) = i + 1;
    return true;
}

int append(KLIBSZHASH *hash, const char *key, heap_ptr<char> value) {
    heap_ptr<char> key_copy{strdup(key)};
    if (!key_copy || (hash->count == hash->capacity && !make_room(hash, hash->capacity * 2)))
        return fail(HERE, kErrMemory);
    // looked up again: growing has moved the slots
    *find_slot(hash, key) = hash->count + 1;
    hash->entries[hash->count++] = {key_copy.release(), value.release()};
    return 0;
}

} // namespace

std::span<const hash_entry> kova::hash_entries(const KLIBSZHASH *hash) {
    return hash != nullptr ? std::span<const hash_entry>{hash->entries, hash->count} : std::span<const hash_entry>{};
}

KLIBSZHASH *KLIBCSzHashAlloc(int capacity) {
    if (capacity < 1)
        return fail(HERE, kErrArgument), nullptr;

    heap_ptr<KLIBSZHASH> hash{static_cast<KLIBSZHASH *>(calloc(1, sizeof(KLIBSZHASH)))};
    if (!hash || !make_room(hash.get(), static_cast<uint32_t>(capacity)))
        return fail(HERE, kErrMemory), nullptr;
    return hash.release();
}

int KLIBCSzHashSetValue(KLIBSZHASH *pHash, const char *szKey, const char *szValue) {
    if (pHash == nullptr || is_empty(szKey) || szValue == nullptr)
        return fail(HERE, kErrArgument);

    heap_ptr<char> value{strdup(szValue)};
    if (!value)
        return fail(HERE, kErrMemory);
    const uint32_t number = *find_slot(pHash, szKey);
    if (number == 0)
        return append(pHash, szKey, std::move(value));
    free(std::exchange(pHash->entries[number - 1].value, value.release()));
    return 0;
}

const char *KLIBCSzHashGetValue(const KLIBSZHASH *pHash, const char *szKey) {
    if (pHash == nullptr || is_empty(szKey))
        return fail(HERE, kErrArgument), nullptr;
    const uint32_t number = *find_slot(pHash, szKey);
    return number != 0 ? pHash->entries[number - 1].value : nullptr;
}

int KLIBCSzHashEnumKey(const KLIBSZHASH *pHash, KLIBSZLIST *pList) {
    if (pHash == nullptr || pList == nullptr)
        return fail(HERE, kErrArgument);
    for (const hash_entry &entry : hash_entries(pHash))
        if (KLIBCSzListPush(&pList, entry.key) < 0)
            return -1;
    return static_cast<int>(pHash->count);
}

void KLIBCSzHashFree(KLIBSZHASH *pHash) {
    if (pHash == nullptr)
        return;
    for (const hash_entry &entry : hash_entries(pHash)) {
        free(entry.key);
        free(entry.value);
    }
    free(pHash->entries);
    free(pHash->slots);
    free(pHash);
}
