#include "kova/core.h"

#include <cstring>

#include "common/guard.h"
#include "common/report.h"

using namespace kova;

namespace {

bool grow(KLIBSZLIST *list) {
    const uint32_t capacity = list->nCapacity < 8 ? 16 : list->nCapacity * 2;
    if (capacity < list->nCapacity)
        return false;
    void *items = reallocarray(list->ppszItem, capacity, sizeof(char *));
    if (items == nullptr)
        return false;
    list->ppszItem = static_cast<char **>(items);
    list->nCapacity = capacity;
    return true;
}

} // namespace

KLIBSZLIST *KLIBCSzListAlloc(int capacity) {
    if (capacity < 1)
        return fail(HERE, kErrArgument), nullptr;

    heap_ptr<KLIBSZLIST> list{static_cast<KLIBSZLIST *>(calloc(1, sizeof(KLIBSZLIST)))};
    if (!list)
        return fail(HERE, kErrMemory), nullptr;
    list->ppszItem = static_cast<char **>(reallocarray(nullptr, static_cast<size_t>(capacity), sizeof(char *)));
    if (list->ppszItem == nullptr)
        return fail(HERE, kErrMemory), nullptr;
    list->nCapacity = static_cast<uint32_t>(capacity);
    return list.release();
}

int KLIBCSzListPush(KLIBSZLIST **ppList, const char *szItem) {
    if (ppList == nullptr || *ppList == nullptr || szItem == nullptr)
        return fail(HERE, kErrArgument);

    KLIBSZLIST *list = *ppList;
    heap_ptr<char> copy{strdup(szItem)};
    if (!copy || (list->nItem == list->nCapacity && !grow(list)))
        return fail(HERE, kErrMemory);
    list->ppszItem[list->nItem++] = copy.release();
    return 0;
}

const char *KLIBCSzListGet(const KLIBSZLIST *pList, int index) {
    if (pList == nullptr || index < 0)
        return fail(HERE, kErrArgument), nullptr;
    return static_cast<uint32_t>(index) < pList->nItem ? pList->ppszItem[index] : nullptr;
}

int KLIBCSzListFind(const KLIBSZLIST *pList, const char *szItem) {
    if (pList == nullptr || szItem == nullptr)
        return fail(HERE, kErrArgument);
    for (uint32_t i = 0; i < pList->nItem; i++)
        if (strcmp(pList->ppszItem[i], szItem) == 0)
            return static_cast<int>(i);
    return -1;
}

void KLIBCSzListRemoveAll(KLIBSZLIST *pList) {
    if (pList == nullptr)
        return;
    for (uint32_t i = 0; i < pList->nItem; i++)
        free(pList->ppszItem[i]);
    pList->nItem = 0;
}

void KLIBCSzListFree(KLIBSZLIST *pList) {
    if (pList == nullptr)
        return;
    KLIBCSzListRemoveAll(pList);
    free(pList->ppszItem);
    free(pList);
}
