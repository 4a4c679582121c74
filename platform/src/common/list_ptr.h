/** @file Owner of a list of texts. */
#ifndef KOVA_PLATFORM_LIST_PTR_H
#define KOVA_PLATFORM_LIST_PTR_H

#include <memory>

#include "kova/core.h"

namespace kova {

struct list_deleter {
    void operator()(KLIBSZLIST *list) const { KLIBCSzListFree(list); }
};
using list_ptr = std::unique_ptr<KLIBSZLIST, list_deleter>;

} // namespace kova

#endif
