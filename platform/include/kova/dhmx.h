/**
 * @file
 * Whether this system is the containerised variant of the appliance.
 */
#ifndef KOVA_DHMX_H
#define KOVA_DHMX_H

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/** @return 1 when docker_hmx="yes" in /etc/kova/platform.conf, else 0 */
int KOVAIsDockerHMX(void);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
