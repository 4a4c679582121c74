#include "core/ifcfg.h"

#include "core/guards.h"

namespace kova {

int rewrite_keys(const place &at, const char *path, std::initializer_list<key_value> set,
                 std::initializer_list<const char *> removed) {
    const string_hash to_set = make_hash();
    const string_hash to_remove = make_hash();
    bool is_complete = to_set.is_held() && to_remove.is_held();
    for (const key_value &line : set) {
        is_complete = is_complete && KLIBCSzHashSetValue(to_set.get(), line.key, line.value) >= 0;
    }
    for (const char *key : removed) {
        is_complete = is_complete && KLIBCSzHashSetValue(to_remove.get(), key, "") >= 0;
    }
    if (!is_complete) {
        return fail_quietly(at, NET_ERR_OUT_OF_MEMORY, -1);
    }
    return KLIBCFileSetKeys(path, to_set.get(), to_remove.get(), kPlainLine) < 0 ? -1 : 0;
}

} // namespace kova
