#include <kovanetsdk/addr.h>

#include "core/guards.h"
#include "core/report.h"

#include <algorithm>
#include <cstring>

using namespace kova;

namespace {

/** Copies the word behind a key that begins the line; without one the output stays as it was. */
void copy_value(const char *line, const char *key, char *output) {
    constexpr char kBlanks[] = " \t\n\v\f\r";
    const size_t key_length = strlen(key);
    if (strncmp(line, key, key_length) != 0) {
        return;
    }
    const char *const word = line + key_length + strspn(line + key_length, kBlanks);
    const size_t length = strcspn(word, kBlanks);
    if (length != 0) {
        memcpy(output, word, length);
        output[length] = '\0';
    }
}

/** Runs the tool and gives back what its first line, of which no more than fits the output is read, has for the key. */
int ask_ipcalc(const place &at, const char *option, const char *key, const char *szSubnet, char *szOutput,
               int cbOutput) {
    const process_stream tool{KLIBCPopen("/bin/ipcalc", "r", option, szSubnet, static_cast<const char *>(nullptr))};
    if (!tool.is_held()) {
        return fail_keeping_code(at, -1, "excute cmd /bin/ipcalc -b %s failed", szSubnet);
    }
    char line[512];
    if (fgets(line, std::min(cbOutput, static_cast<int>(sizeof line)), tool.get()) != nullptr) {
        copy_value(line, key, szOutput);
    }
    return 0;
}

} // namespace

extern "C" int KOVANetCalNetwork(const char *szSubnet, char *szNetwork, int cbNetwork) {
    if (refuses_text(HERE, "szSubnet", szSubnet) || refuses_null(HERE, "szNetwork", szNetwork) ||
        refuses(HERE, cbNetwork > 0, "0 < cbNetwork")) {
        return -1;
    }
    return ask_ipcalc(HERE, "-n", "NETWORK=", szSubnet, szNetwork, cbNetwork);
}

extern "C" int KOVANetCalBroadcast(const char *szSubnet, char *szBroadcast, int cbBroadcast) {
    if (refuses_text(HERE, "szSubnet", szSubnet) || refuses_null(HERE, "szBroadcast", szBroadcast) ||
        refuses(HERE, cbBroadcast > 0, "0 < cbBroadcast")) {
        return -1;
    }
    return ask_ipcalc(HERE, "-b", "BROADCAST=", szSubnet, szBroadcast, cbBroadcast);
}
