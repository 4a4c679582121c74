#include "kova/core.h"

#include <array>
#include <bit>
#include <cstring>
#include <sys/random.h>
#include <sys/stat.h>

#include "common/report.h"
#include "kovacore/file_rewrite.h"
#include "kovacore/line_source.h"

using namespace kova;

namespace {

constexpr const char *kKeyDirectory = "/etc/kova";
constexpr const char *kKeyFile = "/etc/kova/secret.key";
constexpr size_t kKeySize = 32;

using secret_key = std::array<uint32_t, kKeySize / sizeof(uint32_t)>;
using chacha_block = std::array<uint32_t, 16>;

void quarter_round(chacha_block &x, size_t a, size_t b, size_t c, size_t d) {
    x[a] += x[b];
    x[d] = std::rotl(x[d] ^ x[a], 16);
    x[c] += x[d];
    x[b] = std::rotl(x[b] ^ x[c], 12);
    x[a] += x[b];
    x[d] = std::rotl(x[d] ^ x[a], 8);
    x[c] += x[d];
    x[b] = std::rotl(x[b] ^ x[c], 7);
}

/** One block of the ChaCha20 key stream, without a nonce: the same text always gives the same bytes. */
chacha_block chacha20(const secret_key &key, uint32_t counter) {
    chacha_block start = {0x61707865, 0x3320646e, 0x79622d32, 0x6b206574};
    std::copy(key.begin(), key.end(), start.begin() + 4);
    start[12] = counter;
    chacha_block x = start;
    for (int round = 0; round < 10; round++) {
        quarter_round(x, 0, 4, 8, 12);
        quarter_round(x, 1, 5, 9, 13);
        quarter_round(x, 2, 6, 10, 14);
        quarter_round(x, 3, 7, 11, 15);
        quarter_round(x, 0, 5, 10, 15);
        quarter_round(x, 1, 6, 11, 12);
        quarter_round(x, 2, 7, 8, 13);
        quarter_round(x, 3, 4, 9, 14);
    }
    for (size_t i = 0; i < x.size(); i++)
        x[i] += start[i];
    return x;
}

/** The key stream, a word for every byte of text. */
class key_stream {
public:
    explicit key_stream(const secret_key &key) : key_(key) {}
    uint32_t next() {
        if (used_ == block_.size()) {
            block_ = chacha20(key_, counter_++);
            used_ = 0;
        }
        return block_[used_++];
    }

private:
    const secret_key &key_;
    chacha_block block_ = {};
    size_t used_ = block_.size();
    uint32_t counter_ = 0;
};

/** Mirrors 1..255 at a point that the key stream picks, which undoes itself; 0 stays. */
unsigned char mirror(unsigned char byte, uint32_t word) {
    constexpr uint32_t kValues = 255;
    return byte == 0 ? byte : static_cast<unsigned char>((word % kValues + kValues - (byte - 1U)) % kValues + 1);
}

bool read_key(secret_key &key) {
    const unique_fd fd = open_regular(kKeyFile);
    return fd && read_some(fd.get(), key.data(), kKeySize) == static_cast<ssize_t>(kKeySize);
}

/** Whoever is first makes the key, and nobody reads half of one. */
bool make_key() {
    char key[kKeySize];
    if (getrandom(key, sizeof key, 0) != static_cast<ssize_t>(sizeof key))
        return false;
    mkdir(kKeyDirectory, 0755);
    file_rewrite file;
    if (file.open(kKeyFile) < 0)
        return false;
    file.fresh().add({key, sizeof key});
    return file.create(0600) == 0;
}

} // namespace

int KLIBCCryptBufCrypt(const void *pIn, int cbIn, void *pOut, int cbOut) {
    if (pIn == nullptr || cbIn < 0 || pOut == nullptr || cbOut < 1 || cbOut < cbIn)
        return fail(HERE, kErrArgument);

    if (access(kKeyFile, F_OK) < 0 && errno == ENOENT && !make_key())
        return fail(HERE, kErrFileWrite);
    secret_key key;
    if (!read_key(key))
        return fail(HERE, kErrFileOpen);

    key_stream stream{key};
    const auto *in = static_cast<const unsigned char *>(pIn);
    auto *out = static_cast<unsigned char *>(pOut);
    for (int i = 0; i < cbIn; i++)
        out[i] = mirror(in[i], stream.next());
    memset(out + cbIn, 0, static_cast<size_t>(cbOut - cbIn));
    explicit_bzero(key.data(), kKeySize);
    return 0;
}
