/**
 * @file
 * Files that nobody but their owner may read.
 */
#pragma once

#include "core/guards.h"

#include <cstring>

namespace kova {

/** Makes a file of mode 0600, in place of what stands there, that nobody else can have opened before. errno tells why.
 */
[[nodiscard]] stream create_secret_file(const char *path);

/** A record with a secret in it, wiped when it goes. */
template<typename Record> class secret_record {
public:
    secret_record() = default;
    secret_record(const secret_record &) = delete;
    secret_record &operator=(const secret_record &) = delete;
    ~secret_record() { explicit_bzero(&record_, sizeof record_); }
    Record &operator*() { return record_; }

private:
    Record record_{};
};

} // namespace kova
