/**
 * @file
 * Service and job control. The work is done by the appliance's small scripts: /usr/kova/service/<name> with the verbs
 * "status" (exit 0: running) and "reload" (does not wait for the service), and /sbin/stop for jobs. Names consist of
 * letters, digits and "_-.@+", begin with none of "." and "-", and have at most 64 characters.
 */
#ifndef KOVA_SERVICE_H
#define KOVA_SERVICE_H

#pragma GCC visibility push(default)
#ifdef __cplusplus
extern "C" {
#endif

/**
 * Reloads a service ("ddns" ...).
 * @return 0; -1 with 0xD00 (name), 0xBC00 (no such service) or 0x2A00 (the reload failed)
 */
int KLIBServiceReload(const char *szService);
/** @return 1 when a service runs, 0 when not, also when there is no such service; -1 with 0xD00 */
int KLIBServiceIsRunning(const char *szService);
/** Stops a job ("pppoerelay" ...). @return 0, also when it does not run; -1 with 0xD00 or 0x2A00 */
int KLIBServicectlJobStop(const char *szJob);
/** Whether a service is configured to run. */
enum {
    KLIB_SERVICE_RUN = 1,
    KLIB_SERVICE_DO_NOT_RUN = 2,
};

/**
 * Reads whether a service is configured to run: key "run" ("yes") of /etc/kova/service/<name>.conf.
 * @param pRun  receives KLIB_SERVICE_RUN or KLIB_SERVICE_DO_NOT_RUN
 * @return 0; -1 with 0xD00, or 0x900 when the file is missing
 */
int KLIBServicecfgRunKeyGet(const char *szService, int *pRun);
/**
 * Configures whether a service is to run, without starting or stopping it.
 * @param nRun  KLIB_SERVICE_RUN or KLIB_SERVICE_DO_NOT_RUN
 * @return 0; -1 with 0xD00, or as KLIBCFileSetKeyValue
 */
int KLIBServicecfgRunKeySet(const char *szService, int nRun);

#ifdef __cplusplus
}
#endif
#pragma GCC visibility pop

#endif
