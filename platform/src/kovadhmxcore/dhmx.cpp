#include "kova/dhmx.h"

#include "common/platform_conf.h"

int KOVAIsDockerHMX(void) {
    return kova::platform_says("docker_hmx") ? 1 : 0;
}
