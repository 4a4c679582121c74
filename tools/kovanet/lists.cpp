#include "lists.h"

#include "errors.h"

namespace kova {

owned_list make_list(const std::vector<std::string> &texts) {
    constexpr int kCapacity = 16;
    clear_error();
    KLIBSZLIST *list = KLIBCSzListAlloc(kCapacity);
    owned_list owned{list};
    bool is_complete = list != nullptr;
    for (const std::string &text : texts) {
        is_complete = is_complete && KLIBCSzListPush(&list, text.c_str()) == 0;
    }
    if (!is_complete) {
        call_failed("cannot make a list");
    }
    return owned;
}

std::vector<std::string> texts_of(const KLIBSZLIST *list) {
    std::vector<std::string> texts;
    for (int i = 0; list != nullptr && i < static_cast<int>(list->nItem); ++i) {
        texts.emplace_back(KLIBCSzListGet(list, i));
    }
    return texts;
}

} // namespace kova
