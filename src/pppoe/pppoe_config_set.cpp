#include <kovanetsdk/pppoe.h>

#include "core/guards.h"
#include "core/ifcfg.h"
#include "core/kernel_files.h"
#include "core/replacement_file.h"
#include "core/report.h"
#include "core/secret_file.h"
#include "core/text.h"
#include "pppoe/pppoe_files.h"

#include <cstring>
#include <sys/stat.h>

using namespace kova;

namespace {

constexpr char kNewSecrets[] = "/etc/ppp/pap-secrets.tmp";
constexpr char kEth[] = "ETH";
constexpr char kDefaultRoute[] = "DEFAULTROUTE";
constexpr char kUser[] = "USER";
constexpr char kMtu[] = "MTU";

bool refuses_settings(const PPPOE_CONF *pConf) {
    return refuses_null(HERE, "pConf", pConf) ||
           refuses(HERE, is_one_line(pConf->szIfname), "is_one_line(pConf->szIfname)") ||
           refuses(HERE, is_one_line(pConf->szUser), "is_one_line(pConf->szUser)") ||
           refuses(HERE, is_one_line(pConf->szPassword), "is_one_line(pConf->szPassword)") ||
           refuses(HERE, is_one_line(pConf->szMTU), "is_one_line(pConf->szMTU)");
}

int write_conf(const PPPOE_CONF &conf, const char *szQuotedUser) {
    const key_value lines[] = {{kEth, conf.szIfname},
                               {kDefaultRoute, conf.blDefaultRoute != 0 ? "yes" : "no"},
                               {kUser, szQuotedUser},
                               {kMtu, conf.szMTU}};
    for (const key_value &line : lines) {
        if (KLIBCFileSetKeyValue(kPppoeConf, line.key, line.value, kPlainLine) < 0) {
            return fail_keeping_code(HERE_SPACED, -1, "Failed to edit %s", kPppoeConf);
        }
    }
    return 0;
}

int write_secret(const char *szQuotedUser, const char *szPassword) {
    stream file = create_secret_file(kNewSecrets);
    if (!file.is_held()) {
        return fail_keeping_code(HERE_SPACED, -1, "Failed to open tmp file to write PPPoE setting (%s)",
                                 strerror(errno));
    }
    if (fprintf(file.get(), "%s\t*\t%s\n", szQuotedUser, szPassword) < 0) {
        return fail_keeping_code(HERE_SPACED, -1, "Failed to write PPPoE setting (%s)", strerror(errno));
    }
    if (fflush(file.get()) != 0 || fsync(fileno(file.get())) != 0) {
        return fail_keeping_code(HERE_SPACED, -1, "Failed to fflush PPPoE setting.(%s)", strerror(errno));
    }
    return close_written(file) ? 0 : -1;
}

int replace_secrets(const char *szQuotedUser, const char *szPassword) {
    if (write_secret(szQuotedUser, szPassword) < 0) {
        unlink(kNewSecrets);
        return -1;
    }
    if (rename(kNewSecrets, kPapSecrets) != 0) {
        log_err(HERE, "rename %s to %s.tmp failed", kPapSecrets, kPapSecrets);
        unlink(kNewSecrets);
        return -1;
    }
    sync_directory_of(kPapSecrets);
    constexpr mode_t kOwnerOnly = 0600;
    if (chmod(kPapSecrets, kOwnerOnly) != 0) {
        return fail_keeping_code(HERE, -1, "chmod %s failed", kPapSecrets);
    }
    return 0;
}

/** Finds the line of a user, given without quotes. @return its password, within the line; NULL for another line */
const char *password_for(const char *szUser, char *line) {
    char *const star = end_of_quoted(line, "*");
    if (*star != '*') {
        return nullptr;
    }
    *star = '\0';
    char *const user = KLIBCStrTrimSpace(line, line);
    unquote(user);
    return strcmp(user, szUser) == 0 ? KLIBCStrTrimSpace(star + 1, star + 1) : nullptr;
}

int read_password(const char *szUser, PPPOE_CONF &conf) {
    const stream file{fopen(kPapSecrets, "re")};
    if (!file.is_held()) {
        return fail_keeping_code(HERE_SPACED, -1, "Failed to open %s", kPapSecrets);
    }
    while (const heap<char> line = next_line(file)) {
        const char *const szPassword = password_for(szUser, line.get());
        if (szPassword != nullptr) {
            copy_text(conf.szPassword, szPassword);
            return 0;
        }
    }
    return errno == 0 ? 0 : fail_keeping_code(HERE_SPACED, -1, "Failed to read %s", kPapSecrets);
}

} // namespace

extern "C" int PPPoEConfigSet(const PPPOE_CONF *pConf) {
    if (refuses_settings(pConf)) {
        return -1;
    }
    const quoted_user user{pConf->szUser};
    if (write_conf(*pConf, user.c_str()) < 0) {
        return -1;
    }
    return replace_secrets(user.c_str(), pConf->szPassword);
}

extern "C" int PPPoEConfigGet(PPPOE_CONF *pConf) {
    if (pConf == nullptr) {
        return fail(HERE_SPACED, NET_ERR_BAD_PARAMETER, -1, "bad parameter PPPoEConf");
    }
    *pConf = {};
    if (KLIBCFileGetKeyValue(kPppoeConf, kEth, pConf->szIfname, sizeof pConf->szIfname, 0) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to get PPPoE ETH setting.[0x%04X %s:%d]", REGISTER);
    }
    pConf->blDefaultRoute = KLIBCFileCheckKeyValue(kPppoeConf, kDefaultRoute, "yes", 0) == 1 ? 1 : 0;
    char szUser[512]; // as long as it may be with its quotes
    const int has_user = KLIBCFileGetKeyValue(kPppoeConf, kUser, szUser, sizeof szUser, 0);
    if (has_user <= 0) {
        return has_user < 0 ? fail_keeping_code(HERE, -1, "Failed to get PPPoE USER setting.") : 0;
    }
    unquote(szUser);
    copy_text(pConf->szUser, szUser);
    if (KLIBCFileGetKeyValue(kPppoeConf, kMtu, pConf->szMTU, sizeof pConf->szMTU, 0) < 0) {
        return fail_keeping_code(HERE, -1, "Failed to get PPPoE MTU setting.");
    }
    return read_password(szUser, *pConf);
}
