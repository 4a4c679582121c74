#include <kovanetsdk/tunnel.h>

#include "core/commands.h"
#include "core/guards.h"
#include "core/ifcfg.h"
#include "core/pause.h"
#include "core/report.h"
#include "core/secret_file.h"
#include "tunnel/background_work.h"
#include "tunnel/tunnel_files.h"

#include <csignal>
#include <cstring>
#include <kova/service.h>
#include <kovanetsdk/ipv6.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/stat.h>

using namespace kova;

namespace {

constexpr char kScript[] = "/etc/gogoc/rc.tun";
constexpr char kClient[] = "/usr/bin/gogoc";
constexpr char kClientConf[] = "/etc/gogoc/gogoc.conf";
constexpr char kBrokers[] = "tsp-broker-list.txt";
constexpr char kOldBrokers[] = "tsp-broker-list.txt.bak";
constexpr char kRelay[] = "kovarelayd";

/** Keeps a call from deleting the client's configuration while another writes it, which would be made readable. */
class client_conf_lock {
public:
    client_conf_lock() {
        constexpr int kExclusive = 1;
        constexpr int kSeconds = 30;
        (void)KLIBCFileLockTimeByFile(kClientConf, kExclusive, kSeconds, lock_.out());
    }
    [[nodiscard]] bool is_held() const { return lock_.is_held(); }

private:
    file_lock lock_;
};

/** The configuration that one call wrote: another call may have put its own there since. Used under the lock. */
class written_conf {
public:
    /** A file is about to be made. */
    void begin() { state_ = state::unfinished; }
    /** It is whole. @return whether it is there */
    [[nodiscard]] bool finish() {
        const bool is_there = lstat(kClientConf, &status_) == 0;
        state_ = is_there ? state::whole : state_;
        return is_there;
    }
    /** Deletes it, also what was left by a process that ended while it wrote, but no file of another call. */
    void remove() {
        if (is_in_place() && unlink(kClientConf) == 0) {
            state_ = state::none;
        }
    }

private:
    enum class state : unsigned char { none, unfinished, whole };

    [[nodiscard]] bool is_in_place() const {
        if (state_ != state::whole) {
            return state_ == state::unfinished;
        }
        struct stat there;
        return lstat(kClientConf, &there) == 0 && there.st_dev == status_.st_dev && there.st_ino == status_.st_ino &&
               there.st_mtim.tv_sec == status_.st_mtim.tv_sec &&
               there.st_mtim.tv_nsec == status_.st_mtim.tv_nsec; // numbers are used again
    }

    state state_ = state::none;
    struct stat status_ = {};
};

/** One that the call and the process of its own both see; nothing is written at first. */
struct shared_conf_kind {
    static written_conf *none() { return nullptr; }
    static void release(written_conf *conf) { munmap(conf, sizeof *conf); }
};
using shared_conf = owner<shared_conf_kind>;

shared_conf make_shared_conf() {
    void *const zeros = mmap(nullptr, sizeof(written_conf), PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    return shared_conf{zeros != MAP_FAILED ? static_cast<written_conf *>(zeros) : nullptr};
}

void delete_client_conf(written_conf &written) {
    const client_conf_lock lock;
    written.remove();
}

void delete_client_conf_of_anyone() {
    const client_conf_lock lock;
    unlink(kClientConf);
}

/** Makes the file, empty and its owner's alone, before anything goes into it. */
int create_client_conf() {
    unlink(kClientConf);
    constexpr mode_t kOwnerOnly = 0600;
    return KLIBCFileTouch(kClientConf) == 0 && chmod(kClientConf, kOwnerOnly) == 0 ? 0 : -1;
}

/** Puts all lines of the client's configuration into a map. @return 0; -1 for no memory */
int collect_lines(int nAction, const TUNNEL_CONF &conf, KLIBSZHASH *lines) {
    const bool is_start = nAction == KOVA_TUNNEL_START;
    const bool is_anonymous = conf.blAnonymous != 0;
    const key_value all[] = {
        {"host_type", "host"},
        {"prefixlen", "64"},
        {"if_prefix", ""},
        {"dns_server", ""},
        {"gogoc_dir", "/etc/gogoc"},
        {"auto_retry_connect", is_start ? "yes" : "no"},
        {"retry_delay", is_start ? "10" : "3"},
        {"retry_delay_max", is_start ? "30" : "5"},
        {"keepalive", "yes"},
        {"keepalive_interval", "30"},
        {"tunnel_mode", "v6udpv4"},
        {"if_tunnel_v6v4", "sit1"},
        {"if_tunnel_v6udpv4", kTunnelInterface},
        {"if_tunnel_v4v6", "sit0"},
        {"client_v4", "auto"},
        {"client_v6", "auto"},
        {"template", "linux"},
        {"proxy_client", "no"},
        {"broker_list", kBrokers},
        {"last_server", "tsp-last-server.txt"},
        {"always_use_same_server", "no"},
        {"log_file", "0"},
        {"log_filename", "gogoc.log"},
        {"log_rotation", "yes"},
        {"log_rotation_size", "32"},
        {"log_rotation_delete", "no"},
        {"syslog_facility", "USER"},
        {"server", conf.szServer},
        {"auth_method", is_anonymous ? "anonymous" : "any"},
        {"userid", is_anonymous ? "" : conf.szUserId},
        {"passwd", is_anonymous ? "" : conf.szPassword},
    };
    for (const key_value &line : all) {
        if (KLIBCSzHashSetValue(lines, line.key, line.value) < 0) {
            return -1;
        }
    }
    return 0;
}

int write_client_conf(int nAction, const TUNNEL_CONF &conf, written_conf &written) {
    const string_hash lines = make_hash();
    if (!lines.is_held() || collect_lines(nAction, conf, lines.get()) < 0) {
        return fail(HERE, NET_ERR_OUT_OF_MEMORY, -1, "failed to make gogoc config file");
    }
    const client_conf_lock lock;
    if (!lock.is_held()) {
        return fail_keeping_code(HERE, -1, "failed to make gogoc config file");
    }
    written.begin();
    if (create_client_conf() < 0 || KLIBCFileSetKeys(kClientConf, lines.get(), nullptr, kPlainLine) < 0 ||
        !written.finish()) {
        written.remove();
        return fail_keeping_code(HERE, -1, "failed to make gogoc config file");
    }
    return 0;
}

const char *script_word(int nAction) {
    switch (nAction) {
    case KOVA_TUNNEL_START:
        return "start";
    case KOVA_TUNNEL_STOP:
        return "stop";
    case KOVA_TUNNEL_RESTART:
        return "restart";
    default:
        return nullptr;
    }
}

bool needs_client_conf(int nAction) {
    return nAction == KOVA_TUNNEL_START || nAction == KOVA_TUNNEL_RESTART;
}

struct request {
    int nAction;
    const TUNNEL_CONF *pConf;
    written_conf *written;
};

int make_client_conf(const request &about) {
    if (about.pConf != nullptr) {
        return write_client_conf(about.nAction, *about.pConf, *about.written);
    }
    secret_record<TUNNEL_CONF> stored;
    if (KOVATunnelConfigGet(&*stored) < 0) {
        return fail_keeping_code(HERE, -1, "unable to get Tunnel config, file crashed or not set.");
    }
    return write_client_conf(about.nAction, *stored, *about.written);
}

/** What the process of its own does. */
void run_script(const void *data) {
    const request &about = *static_cast<const request *>(data);
    const char *const szWord = script_word(about.nAction);
    prctl(PR_SET_DUMPABLE, 0); // it has the password in its memory
    if (szWord == nullptr) {
        delete_client_conf_of_anyone();
        return;
    }
    if (needs_client_conf(about.nAction) && make_client_conf(about) < 0) {
        log_err(HERE, "Failed to make tunnel config file.");
        return;
    }
    if (run(kScript, szWord) != 0) {
        log_err(HERE, "excute command %s %s failed", kScript, szWord);
    }
    if (needs_client_conf(about.nAction)) {
        delete_client_conf(*about.written);
    }
    log_info(HERE, "done gogoc processing");
}

void wait_for(const background_work &script) {
    constexpr int kPolls = 45;
    for (int i = 0; i < kPolls; ++i) {
        if (script.has_ended()) {
            return;
        }
        pause_for_seconds(1);
    }
    log_info(HERE, "connecting to tunnel broker timeout");
}

/** The next start begins with the broker that is configured, not with those that it once referred to. */
void put_brokers_aside() {
    if (rename(kBrokers, kOldBrokers) != 0) {
        log_info(HERE, "unable to move broker_list, %s, errno:%d, %s", kBrokers, errno, strerror(errno));
    }
}

/** @return 0; -1, logged, when a client hangs or was not stopped */
int check_tunnel(int nAction) {
    KOVAV6IP address;
    if (KOVALnxV6IPGet(kTunnelInterface, &address, 1) > 0) {
        if (nAction == KOVA_TUNNEL_STOP) {
            return fail_keeping_code(HERE, -1, "gogoc still alive, failed to stop");
        }
        if (needs_client_conf(nAction)) {
            log_info(HERE, "tunnel connection setup");
        }
        return 0;
    }
    const bool may_go_on = nAction != KOVA_TUNNEL_STOP && nAction != KOVA_TUNNEL_RESTART;
    if (may_go_on || KLIBCIsProcAlive(kClient) != 1) {
        return 0;
    }
    log_err(HERE, "gogoc hangs, terminate it.");
    (void)KLIBCKill(kClient, SIGKILL);
    delete_client_conf_of_anyone(); // nobody is left to read it
    return -1;
}

} // namespace

extern "C" int KOVATunnelExecute(int nAction, const TUNNEL_CONF *pConf) {
    if (needs_client_conf(nAction) && pConf != nullptr && refuses_login(HERE, *pConf)) {
        return -1;
    }
    const shared_conf written = make_shared_conf();
    if (!written.is_held()) {
        return fail(HERE, NET_ERR_OUT_OF_MEMORY, -1, "Fail to share memory, errno=[%d/%m]", errno);
    }
    const request about{nAction, pConf, written.get()};
    background_work script;
    if (!script.start(run_script, &about)) {
        return fail_keeping_code(HERE, -1, "Fail to fork, errno=[%d/%m]", errno);
    }
    wait_for(script);
    delete_client_conf(*written.get()); // a process that was killed has left it
    put_brokers_aside();
    if (check_tunnel(nAction) < 0) {
        return -1;
    }
    if (KLIBServiceIsRunning(kRelay) == 1) {
        (void)KLIBServiceReload(kRelay);
    }
    return 0;
}
