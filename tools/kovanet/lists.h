/**
 * @file
 * The library's lists of texts, owned.
 */
#pragma once

#include <kova/core.h>
#include <memory>
#include <string>
#include <vector>

namespace kova {

struct list_free {
    void operator()(KLIBSZLIST *list) const { KLIBCSzListFree(list); }
};
using owned_list = std::unique_ptr<KLIBSZLIST, list_free>;

/** A list of some texts. Ends the program when there is no memory for it. */
owned_list make_list(const std::vector<std::string> &texts = {});

/** What a list holds; nothing without one. */
std::vector<std::string> texts_of(const KLIBSZLIST *list);

} // namespace kova
