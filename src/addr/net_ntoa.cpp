#include <kovanetsdk/addr.h>

#include <cstdio>
#include <cstring>

extern "C" const char *KOVANetNtoa(uint32_t nIP) {
    static char text[18];
    unsigned char byte[sizeof nIP];
    memcpy(byte, &nIP, sizeof byte);
    snprintf(text, sizeof text, "%d.%d.%d.%d", byte[0], byte[1], byte[2], byte[3]);
    return text;
}
