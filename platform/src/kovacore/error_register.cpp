#include "kova/core.h"

namespace {

struct error_entry {
    uint32_t code;
    const char *file;
    int line;
};

constinit thread_local error_entry g_entry = {0, "", 0};

} // namespace

void KLIBCErrSetEx(uint32_t code, const char *szFile, int line) {
    g_entry = {code, szFile != nullptr ? szFile : "", line};
}

uint32_t KLIBCErrGet(void) {
    return g_entry.code;
}

const char *KLIBCErrorGetFile(void) {
    return g_entry.file;
}

int KLIBCErrorGetLine(void) {
    return g_entry.line;
}
