#include "core/ifcfg.h"

namespace kova {

void key_changes::set(const char *key, const char *value) {
    is_complete_ = is_complete_ && KLIBCSzHashSetValue(to_set_.get(), key, value) >= 0;
}

void key_changes::remove(const char *key) {
    is_complete_ = is_complete_ && KLIBCSzHashSetValue(to_remove_.get(), key, "") >= 0;
}

int key_changes::apply(const char *path) const {
    return KLIBCFileSetKeys(path, to_set_.get(), to_remove_.get(), kPlainLine) < 0 ? -1 : 0;
}

int rewrite_keys(const place &at, const char *path, std::initializer_list<key_value> set,
                 std::initializer_list<const char *> removed) {
    key_changes changes;
    for (const key_value &line : set) {
        changes.set(line.key, line.value);
    }
    for (const char *key : removed) {
        changes.remove(key);
    }
    return changes.is_complete() ? changes.apply(path) : fail_quietly(at, NET_ERR_OUT_OF_MEMORY, -1);
}

} // namespace kova
