#include <kovanetsdk/tunnel.h>

#include "core/guards.h"
#include "core/ifcfg.h"
#include "core/replacement_file.h"
#include "core/report.h"
#include "core/secret_file.h"
#include "core/text.h"
#include "tunnel/tunnel_files.h"

#include <algorithm>
#include <cstring>
#include <fcntl.h>
#include <kova/service.h>
#include <strings.h>

using namespace kova;

namespace {

constexpr char kPassword[] = "/etc/gogoc/.tunnel_passwd";
constexpr char kLogin[] = "LOGIN";
constexpr char kServer[] = "SERVER";
constexpr char kUserId[] = "USERID";
constexpr char kAnonymous[] = "anonymous";

/** What the file of the stored password is: the enciphered text, and zeros behind it. */
constexpr size_t kPasswordBlock = 64;

/** @return 1; 0 without the key, out is "" then; -1, logged */
template<size_t Size> int read_key(const ifcfg_path &file, const char *key, char (&out)[Size]) {
    *out = '\0';
    const int found = KLIBCFileGetKeyValue(file.c_str(), key, out, Size, 0);
    return found < 0 ? fail_keeping_code(HERE, -1, "Failed to get [%s] from [%s], kovaerr=[0x%04X]", key, file.c_str(),
                                         KLIBCErrGet())
                     : std::min(found, 1);
}

/** Reads the password as it is stored, "" without one. @return 0; -1, logged */
int read_enciphered(char (&text)[kPasswordBlock]) {
    const descriptor fd{open(kPassword, O_RDONLY | O_NOFOLLOW | O_CLOEXEC)};
    if (!fd.is_held()) {
        return errno == ENOENT
                   ? 0
                   : fail(HERE, NET_ERR_FILE_OPEN, -1, "Fail to open [%s], errno=[%d/%m]", kPassword, errno);
    }
    const ssize_t got = read(fd.get(), text, sizeof text - 1);
    if (got < 0) {
        return fail(HERE, NET_ERR_FILE_READ, -1, "Fail to read [%s], errno=[%d/%m]", kPassword, errno);
    }
    if (got == 0) {
        log_info(HERE, "file %s is empty", kPassword);
    }
    return 0;
}

/** @return 0, also without a stored password; -1, logged */
int read_password(char (&szPassword)[sizeof(TUNNEL_CONF::szPassword)]) {
    char text[kPasswordBlock] = "";
    if (read_enciphered(text) < 0) {
        return -1;
    }
    const size_t length = strlen(text);
    if (length >= sizeof szPassword) {
        return fail_keeping_code(HERE_IN_UNIT_AS("TunnelPasswdGet"), -1, "lenPasswdEnc is not enough!!");
    }
    if (length > 0 && KLIBCCryptBufCrypt(text, static_cast<int>(length), szPassword, sizeof szPassword) != 0) {
        return fail_keeping_code(HERE, -1, "Failed to decipher [%s], kovaerr=[0x%04X]", kPassword, KLIBCErrGet());
    }
    return 0;
}

/** Reads what the file says, whether it counts or not: an anonymous account may still name a user. */
int read_file(TUNNEL_CONF &conf) {
    const ifcfg_path file{kTunnelInterface};
    conf.blAnonymous = 1;
    if (KLIBCFileExist(file.c_str()) != 1) {
        return 0;
    }
    char szLogin[32];
    const int has_server = read_key(file, kServer, conf.szServer);
    const int has_login = has_server < 0 ? -1 : read_key(file, kLogin, szLogin);
    if (has_login < 0 || read_key(file, kUserId, conf.szUserId) < 0) {
        return -1;
    }
    conf.blAnonymous = has_login == 0 || strcasecmp(szLogin, kAnonymous) == 0 ? 1 : 0;
    return 0;
}

/** The same with the password of an account with a user. */
int read_account(TUNNEL_CONF &conf) {
    return read_file(conf) < 0 || (conf.blAnonymous == 0 && read_password(conf.szPassword) < 0) ? -1 : 0;
}

/** Each call writes a file of its own, its owner's alone from the beginning, so that the last of several counts. */
int write_block(const char (&block)[kPasswordBlock]) {
    constexpr mode_t kOwnerOnly = 0600;
    replacement_file file{kPassword};
    return file.is_open() && fwrite(block, 1, sizeof block, file.get()) == sizeof block && file.finish(kOwnerOnly) &&
                   file.replace()
               ? 0
               : -1;
}

int store_password(const char (&szPassword)[sizeof(TUNNEL_CONF::szPassword)]) {
    if (!ends_within(szPassword)) {
        return fail_keeping_code(HERE_IN_UNIT_AS("TunnelPasswdSet"), -1, "lenPassword is not enough!!");
    }
    char block[kPasswordBlock];
    if (KLIBCCryptBufCrypt(szPassword, static_cast<int>(strlen(szPassword)), block, sizeof block) != 0) {
        return fail_keeping_code(HERE, -1, "Failed to encipher the password, kovaerr=[0x%04X]", KLIBCErrGet());
    }
    if (write_block(block) < 0) {
        return fail_keeping_code(HERE, -1, "failed to save tunnel password");
    }
    return 0;
}

/** Whether a password is to be stored: an anonymous account leaves it, and the stored one is not looked at there. */
bool is_new_password(const TUNNEL_CONF &conf, const TUNNEL_CONF &stored) {
    return conf.blAnonymous == 0 &&
           (stored.blAnonymous != 0 || strncmp(conf.szPassword, stored.szPassword, sizeof conf.szPassword) != 0);
}

/** An anonymous account that is stored as it was read changes no user, although the file may name one. */
bool is_new_user(const TUNNEL_CONF &conf, const TUNNEL_CONF &stored) {
    const bool is_as_read = conf.blAnonymous != 0 && stored.blAnonymous != 0 && *conf.szUserId == '\0';
    return !is_as_read && strcmp(conf.szUserId, stored.szUserId) != 0;
}

/** Collects the keys that differ. @return their number; -1 for no memory */
int collect_changes(const TUNNEL_CONF &conf, const TUNNEL_CONF &stored, KLIBSZHASH *changes) {
    const struct {
        bool is_new;
        key_value line;
    } keys[] = {
        {(conf.blAnonymous != 0) != (stored.blAnonymous != 0), {kLogin, conf.blAnonymous != 0 ? kAnonymous : "login"}},
        {*conf.szServer != '\0' && strcmp(conf.szServer, stored.szServer) != 0, {kServer, conf.szServer}},
        {is_new_user(conf, stored), {kUserId, conf.szUserId}},
    };
    int number = 0;
    for (const auto &key : keys) {
        if (key.is_new && KLIBCSzHashSetValue(changes, key.line.key, key.line.value) < 0) {
            return -1;
        }
        number += key.is_new ? 1 : 0;
    }
    return number;
}

} // namespace

extern "C" int KOVATunnelConfigGet(TUNNEL_CONF *pConf) {
    if (refuses_null(HERE, "pConf", pConf)) {
        return -1;
    }
    *pConf = {};
    constexpr int kEnabled = 1;
    int run = 0;
    if (KLIBServicecfgRunKeyGet("kovatunnel", &run) != 0) {
        return fail_keeping_code(HERE, -1, "Failed to get the run key of [%s], kovaerr=[0x%04X]", "kovatunnel",
                                 KLIBCErrGet());
    }
    if (read_account(*pConf) < 0) {
        explicit_bzero(pConf, sizeof *pConf);
        return -1;
    }
    if (pConf->blAnonymous != 0) {
        *pConf->szUserId = '\0';
    }
    return run == kEnabled ? 1 : 0;
}

extern "C" int KOVATunnelConfigSet(const TUNNEL_CONF *pConf) {
    if (refuses_null(HERE, "pConf", pConf) || refuses_account(HERE, *pConf) ||
        (ends_within(pConf->szPassword) && refuses_password(HERE, *pConf))) {
        return -1;
    }
    secret_record<TUNNEL_CONF> stored;
    if (read_account(*stored) < 0) {
        return fail_keeping_code(HERE, -1, "failed to get Tunnel Config");
    }
    if (is_new_password(*pConf, *stored) && store_password(pConf->szPassword) < 0) {
        return fail_keeping_code(HERE, -1, "failed to set passwd");
    }
    const string_hash changes = make_hash();
    const int number = changes.is_held() ? collect_changes(*pConf, *stored, changes.get()) : -1;
    if (number < 0) {
        return fail(HERE, NET_ERR_OUT_OF_MEMORY, -1, "failed to alloc hash");
    }
    if (number > 0 && KLIBCFileSetKeys(ifcfg_path{kTunnelInterface}.c_str(), changes.get(), nullptr, kQuotedLine) < 0) {
        return fail_keeping_code(HERE, -1, "failed to write configs");
    }
    return 0;
}
