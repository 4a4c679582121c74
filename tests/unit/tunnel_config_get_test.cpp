#include "support/rig.h"

#include <cstring>
#include <kova/core.h>
#include <kovanetsdk/tunnel.h>
#include <sys/stat.h>
#include <utility>

using namespace kova_test;

namespace {

const std::string kUnit = "tunnel_config_get";
const std::string kFile = ifcfg("tun");
const std::string kPassword = "/etc/gogoc/.tunnel_passwd";
const std::string kRun = "/etc/kova/service/kovatunnel.conf";
const std::string kNotSaved = "ERR tunnel_config_get:N failed to save tunnel password";
const std::string kNotSet = "ERR tunnel_config_get:N failed to set passwd";

TUNNEL_CONF account(const std::string &server, const std::string &user, const std::string &password,
                    uint8_t is_anonymous = 0) {
    TUNNEL_CONF conf = {};
    conf.blAnonymous = is_anonymous;
    memcpy(conf.szServer, server.data(), std::min(server.size(), sizeof conf.szServer));
    memcpy(conf.szUserId, user.data(), std::min(user.size(), sizeof conf.szUserId));
    memcpy(conf.szPassword, password.data(), std::min(password.size(), sizeof conf.szPassword));
    return conf;
}

TUNNEL_CONF anonymous(const std::string &server, const std::string &user = "") {
    return account(server, user, "", 1);
}

/** A text as the file of the password has it. */
std::string enciphered(const std::string &text) {
    char block[64];
    EXPECT_EQ(0, KLIBCCryptBufCrypt(text.data(), static_cast<int>(text.size()), block, sizeof block));
    return {block, sizeof block};
}

struct stat status_of(const std::string &path) {
    struct stat status = {};
    EXPECT_EQ(0, lstat(path.c_str(), &status)) << path;
    return status;
}

} // namespace

class tunnel_config_get : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        write_file(kRun, "run=yes\n");
    }
    outcome set(const TUNNEL_CONF &conf) {
        return rig.observe([&] { return KOVATunnelConfigSet(&conf); });
    }
    outcome get() {
        memset(&read, 'u', sizeof read);
        return rig.observe([this] { return KOVATunnelConfigGet(&read); });
    }
    void expect_read(const TUNNEL_CONF &expected) const {
        EXPECT_EQ(expected.blAnonymous, read.blAnonymous);
        EXPECT_STREQ(expected.szServer, read.szServer);
        EXPECT_STREQ(expected.szUserId, read.szUserId);
        EXPECT_STREQ(expected.szPassword, read.szPassword);
    }
    void expect_nothing_read() const {
        const TUNNEL_CONF nothing = {};
        EXPECT_EQ(0, memcmp(&nothing, &read, sizeof read));
    }

    TUNNEL_CONF read;
};

// ---- reading

TEST_F(tunnel_config_get, KOVATunnelConfigGet_runKey_isTheResult) {
    EXPECT_OUTCOME(get(), {.result = 1});
    write_file(kRun, "run=no\n");
    EXPECT_OUTCOME(get(), {.result = 0});
    write_file(kRun, "other=yes\n");
    EXPECT_OUTCOME(get(), {.result = 0});
    shell("rm " + kRun);
    EXPECT_OUTCOME(get(), {.result = -1,
                           .code = 0x900,
                           .unit = "key_value",
                           .log = {"ERR tunnel_config_get:N Failed to get the run key of [kovatunnel], "
                                   "kovaerr=[0x0900]"}});
    expect_nothing_read();
}

TEST_F(tunnel_config_get, KOVATunnelConfigGet_nothingStored_isAnAnonymousAccountWithoutServer) {
    EXPECT_OUTCOME(get(), {.result = 1});
    expect_read(anonymous(""));
    write_file(kFile, "DEVICE=tun\n");
    EXPECT_OUTCOME(get(), {.result = 1});
    expect_read(anonymous(""));
}

TEST_F(tunnel_config_get, KOVATunnelConfigGet_login_decidesAboutUserAndPassword) {
    write_file(kPassword, enciphered("secret"));
    for (const char *word : {"anonymous", "Anonymous", "ANONYMOUS"}) {
        write_file(kFile, std::string("LOGIN=\"") + word + "\"\nSERVER=\"broker\"\nUSERID=\"user\"\n");
        EXPECT_OUTCOME(get(), {.result = 1});
        expect_read(anonymous("broker"));
    }
    for (const char *word : {"login", "anonymou", "anonymous ", "x", ""}) {
        write_file(kFile, std::string("LOGIN=\"") + word + "\"\nSERVER=\"broker\"\nUSERID=\"user\"\n");
        EXPECT_OUTCOME(get(), {.result = 1});
        expect_read(account("broker", "user", "secret"));
    }
    write_file(kFile, "LOGIN=login\n");
    EXPECT_OUTCOME(get(), {.result = 1});
    expect_read(account("", "", "secret"));
}

TEST_F(tunnel_config_get, KOVATunnelConfigGet_valuesThatAreTooLong_areCut) {
    write_file(kFile, "LOGIN=login\nSERVER=" + long_text(300) + "\nUSERID=" + long_text(256, 'u') + "\n");
    EXPECT_OUTCOME(get(), {.result = 1});
    expect_read(account(long_text(255), long_text(255, 'u'), ""));
}

TEST_F(tunnel_config_get, KOVATunnelConfigGet_passwordFiles_ofEveryLength) {
    write_file(kFile, "LOGIN=login\n");
    EXPECT_OUTCOME(get(), {.result = 1});
    EXPECT_STREQ("", read.szPassword) << "no file";
    write_file(kPassword, "");
    EXPECT_OUTCOME(get(), {.result = 1, .log = {"INFO tunnel_config_get:N file /etc/gogoc/.tunnel_passwd is empty"}});
    EXPECT_STREQ("", read.szPassword);
    write_file(kPassword, std::string(64, '\0'));
    EXPECT_OUTCOME(get(), {.result = 1});
    EXPECT_STREQ("", read.szPassword);
    for (const size_t length : {1U, 2U, 30U, 31U}) {
        write_file(kPassword, enciphered(long_text(length)));
        EXPECT_OUTCOME(get(), {.result = 1});
        EXPECT_EQ(long_text(length), read.szPassword);
        write_file(kPassword, enciphered(long_text(length)).substr(0, length));
        EXPECT_OUTCOME(get(), {.result = 1}); // without the zeros
        EXPECT_EQ(long_text(length), read.szPassword);
    }
    for (const size_t length : {32U, 33U, 62U, 63U, 64U}) {
        write_file(kPassword, enciphered(long_text(length)));
        EXPECT_OUTCOME(
            get(), {.result = -1, .log = {"ERR tunnel_config_get TunnelPasswdGet(N): lenPasswdEnc is not enough!!"}});
        expect_nothing_read();
    }
    write_file(kPassword, long_text(100000));
    EXPECT_EQ(-1, get().result);
}

TEST_F(tunnel_config_get, KOVATunnelConfigGet_whatCannotBeRead_leavesTheRecordEmpty) {
    write_file(kFile, "LOGIN=login\nSERVER=broker\nUSERID=user\n");
    write_file(kPassword, enciphered("secret"));
    for (const auto &[nth, key] : std::map<int, std::string>{{1, "SERVER"}, {2, "LOGIN"}, {3, "USERID"}}) {
        rig.fail("KLIBCFileGetKeyValue", nth);
        EXPECT_OUTCOME(get(), {.result = -1,
                               .code = 0x900,
                               .unit = "platform",
                               .log = {"ERR tunnel_config_get:N Failed to get [" + key + "] from [" + kFile +
                                       "], kovaerr=[0x0900]"}});
        expect_nothing_read();
    }
    rig.fail("KLIBCCryptBufCrypt");
    EXPECT_OUTCOME(get(), {.result = -1,
                           .code = 0x900,
                           .unit = "platform",
                           .log = {"ERR tunnel_config_get:N Failed to decipher [/etc/gogoc/.tunnel_passwd], "
                                   "kovaerr=[0x0900]"}});
    expect_nothing_read();
    shell("rm " + kPassword + " && mkdir " + kPassword);
    EXPECT_OUTCOME(get(), {.result = -1,
                           .code = 0xA00,
                           .unit = kUnit,
                           .log = {"ERR tunnel_config_get:N Fail to read [/etc/gogoc/.tunnel_passwd], "
                                   "errno=[21/Is a directory]"}});
    expect_nothing_read();
    shell("rmdir " + kPassword + " && ln -s /etc/passwd " + kPassword);
    EXPECT_OUTCOME(get(), {.result = -1,
                           .code = 0x900,
                           .unit = kUnit,
                           .log = {"ERR tunnel_config_get:N Fail to open [/etc/gogoc/.tunnel_passwd], "
                                   "errno=[40/Too many levels of symbolic links]"}});
    expect_nothing_read();
}

TEST_F(tunnel_config_get, KOVATunnelConfigGet_anotherMachinesKey_doesNotBringThePasswordBack) {
    ASSERT_EQ(0, set(account("broker", "user", "secret")).result);
    ASSERT_EQ(1, get().result);
    EXPECT_STREQ("secret", read.szPassword);
    shell("rm /etc/kova/secret.key");
    ASSERT_EQ(1, get().result);
    EXPECT_STRNE("secret", read.szPassword);
}

// ---- storing

TEST_F(tunnel_config_get, KOVATunnelConfigSet_firstAccount_isStored) {
    shell("rmdir /etc/kova/service 2>/dev/null; true");
    EXPECT_OUTCOME(set(account("broker.example", "user", "secret")), {.result = 0});
    EXPECT_EQ("LOGIN=\"login\"\nSERVER=\"broker.example\"\nUSERID=\"user\"\n", read_file(kFile));
    EXPECT_EQ(enciphered("secret"), read_file(kPassword));
    EXPECT_EQ(texts{".tunnel_passwd"}, list_dir("/etc/gogoc"));
}

TEST_F(tunnel_config_get, KOVATunnelConfigSet_firstAnonymousAccount_isTheServerAlone) {
    EXPECT_OUTCOME(set(anonymous("broker.example")), {.result = 0});
    EXPECT_EQ("SERVER=\"broker.example\"\n", read_file(kFile));
    EXPECT_EQ(texts{}, list_dir("/etc/gogoc"));
}

TEST_F(tunnel_config_get, KOVATunnelConfigSet_sameAccount_writesNothing) {
    for (const TUNNEL_CONF &conf : {anonymous("broker"), anonymous("broker", "user"),
                                    account("broker", "user", "secret"), account("broker", "", "")}) {
        ASSERT_EQ(0, set(conf).result);
        const ino_t file = status_of(kFile).st_ino;
        const std::string content = read_file(kFile);
        const ino_t password = conf.blAnonymous != 0 ? 0 : status_of(kPassword).st_ino;
        rig.fail_from("KLIBCFileSetKeys"); // whatever is tried
        rig.fail_from("rename");
        EXPECT_OUTCOME(set(conf), {.result = 0});
        ASSERT_EQ(1, get().result);
        EXPECT_OUTCOME(set(read), {.result = 0}); // as it was read
        rig.keep_failures({});
        EXPECT_EQ(file, status_of(kFile).st_ino);
        EXPECT_EQ(content, read_file(kFile));
        if (conf.blAnonymous == 0) {
            EXPECT_EQ(password, status_of(kPassword).st_ino);
        }
    }
}

TEST_F(tunnel_config_get, KOVATunnelConfigSet_oneThingThatDiffers_isTheOnlyOneWritten) {
    ASSERT_EQ(0, set(account("broker", "user", "secret")).result);
    write_file(kFile, "# mine\nUSERID=user\nLOGIN=login\nSERVER=broker\nOTHER=1\n");
    EXPECT_OUTCOME(set(account("other", "user", "secret")), {.result = 0});
    EXPECT_EQ("# mine\nUSERID=user\nLOGIN=login\nSERVER=\"other\"\nOTHER=1\n", read_file(kFile));
    EXPECT_OUTCOME(set(account("other", "", "secret")), {.result = 0});
    EXPECT_EQ("# mine\nUSERID=\"\"\nLOGIN=login\nSERVER=\"other\"\nOTHER=1\n", read_file(kFile));
    EXPECT_OUTCOME(set(account("", "", "secret")), {.result = 0});
    EXPECT_EQ("# mine\nUSERID=\"\"\nLOGIN=login\nSERVER=\"other\"\nOTHER=1\n", read_file(kFile))
        << "no server: it stays";
    rig.fail("KLIBCFileSetKeys");
    EXPECT_OUTCOME(set(account("other", "", "new")), {.result = 0}); // the password alone
    rig.keep_failures({});
    EXPECT_EQ(enciphered("new"), read_file(kPassword));
    EXPECT_OUTCOME(set(anonymous("other")), {.result = 0});
    EXPECT_EQ("# mine\nUSERID=\"\"\nLOGIN=\"anonymous\"\nSERVER=\"other\"\nOTHER=1\n", read_file(kFile));
    EXPECT_EQ(enciphered("new"), read_file(kPassword)) << "an anonymous account leaves it";
}

TEST_F(tunnel_config_get, KOVATunnelConfigSet_afterAnAnonymousAccount_nothingOldComesBack) {
    ASSERT_EQ(0, set(account("broker", "old user", "old secret")).result);
    write_file(kFile, "LOGIN=anonymous\nSERVER=broker\nUSERID=old user\n");
    EXPECT_OUTCOME(set(account("broker", "", "")), {.result = 0});
    ASSERT_EQ(1, get().result);
    expect_read(account("broker", "", ""));
}

TEST_F(tunnel_config_get, KOVATunnelConfigSet_whatWasStored_isReadBack) {
    const texts users{
        "u",         "a'b",          "''",           "\"x\"", " around ", "in side",  "tab\tin",  "a*b",
        "*",         "#hash",        "back\\",       "a=b",   "%s%n",     "\x01\x7f", "\xc3\xbc", "user@example.net",
        "$(reboot)", long_text(254), long_text(255), "\"",    "\"\""};
    const texts passwords{"p",         "a*b",         "*",
                          " in side ", "'quoted'",    "\"q\"",
                          "#hash",     "a\\nb\\",     "%s%n",
                          "\x01\x7f",  "a\tb",        "\xc3\xbc\xe2\x82\xac",
                          "$(x)",      long_text(30), long_text(31, '\xff')};
    for (size_t i = 0; i < users.size(); ++i) {
        const TUNNEL_CONF conf = account(users[users.size() - 1 - i], users[i], passwords[i % passwords.size()]);
        EXPECT_OUTCOME(set(conf), {.result = 0});
        EXPECT_OUTCOME(get(), {.result = 1});
        expect_read(conf);
        EXPECT_EQ(64U, read_file(kPassword).size());
        EXPECT_EQ(std::string::npos, read_file(kPassword).find(passwords[i % passwords.size()]));
    }
}

TEST_F(tunnel_config_get, KOVATunnelConfigSet_password_isNobodyElsesFromTheBeginning) {
    (void)enciphered("makes the key");
    const mode_t old = umask(0);
    write_file(kPassword, "");
    shell("chmod 666 " + kPassword);
    bool is_in_place = false;
    rig.before("fsync", [&] {
        if (std::exchange(is_in_place, true)) {
            return; // the directory's turn
        }
        for (const std::string &name : list_dir("/etc/gogoc")) {
            const bool is_old = name == ".tunnel_passwd";
            EXPECT_EQ(S_IFREG | (is_old ? 0666U : 0600U), status_of("/etc/gogoc/" + name).st_mode) << name;
        }
    });
    EXPECT_EQ(0, set(account("broker", "user", "secret")).result);
    umask(old);
    EXPECT_EQ(S_IFREG | 0600U, status_of(kPassword).st_mode);
    EXPECT_EQ(texts{".tunnel_passwd"}, list_dir("/etc/gogoc"));
}

TEST_F(tunnel_config_get, KOVATunnelConfigSet_callsAtOnce_storeWholePasswords) {
    const std::string expected = enciphered("secret");
    const TUNNEL_CONF other = account("broker", "user", "other");
    bool is_nested = false;
    rig.before("fsync", [&] {
        if (!std::exchange(is_nested, true)) {
            EXPECT_EQ(0, KOVATunnelConfigSet(&other));
            EXPECT_EQ(enciphered("other"), read_file(kPassword));
        }
    });
    EXPECT_OUTCOME(set(account("broker", "user", "secret")), {.result = 0});
    EXPECT_TRUE(is_nested);
    EXPECT_EQ(expected, read_file(kPassword));
    EXPECT_EQ(texts{".tunnel_passwd"}, list_dir("/etc/gogoc"));
}

TEST_F(tunnel_config_get, KOVATunnelConfigSet_passwordThatDoesNotEnd_isRefused) {
    ASSERT_EQ(0, set(account("broker", "user", "secret")).result);
    EXPECT_OUTCOME(
        set(account("other", "other", long_text(32))),
        {.result = -1, .log = {"ERR tunnel_config_get TunnelPasswdSet(N): lenPassword is not enough!!", kNotSet}});
    ASSERT_EQ(1, get().result);
    expect_read(account("broker", "user", "secret"));
    EXPECT_OUTCOME(set(account("broker", "user", long_text(32), 1)), {.result = 0}); // nobody asks for it
}

TEST_F(tunnel_config_get, KOVATunnelConfigSet_passwordThatCannotBeStored_leavesEverything) {
    ASSERT_EQ(0, set(account("broker", "user", "secret")).result);
    const auto expect_kept = [this] {
        EXPECT_EQ(texts{".tunnel_passwd"}, list_dir("/etc/gogoc"));
        ASSERT_EQ(1, get().result);
        expect_read(account("broker", "user", "secret"));
    };
    for (const char *operation : {"fsync", "rename"}) {
        SCOPED_TRACE(operation);
        rig.fail(operation);
        EXPECT_OUTCOME(set(account("other", "other", "new")), {.result = -1, .log = {kNotSaved, kNotSet}});
        expect_kept();
    }
    rig.fail("KLIBCCryptBufCrypt", 2);
    EXPECT_OUTCOME(set(account("other", "other", "new")),
                   {.result = -1,
                    .code = 0x900,
                    .unit = "platform",
                    .log = {"ERR tunnel_config_get:N Failed to encipher the password, kovaerr=[0x0900]", kNotSet}});
    expect_kept();
    rig.fail("KLIBCFileTempFileOpen");
    EXPECT_OUTCOME(set(account("other", "other", "new")),
                   {.result = -1, .code = 0x900, .unit = "platform", .log = {kNotSaved, kNotSet}});
    expect_kept();
}

TEST_F(tunnel_config_get, KOVATunnelConfigSet_keysThatCannotBeWritten_areTold) {
    rig.fail("KLIBCFileSetKeys");
    EXPECT_OUTCOME(
        set(anonymous("broker")),
        {.result = -1, .code = 0xB00, .unit = "platform", .log = {"ERR tunnel_config_get:N failed to write configs"}});
    for (const char *operation : {"KLIBCSzHashAlloc", "KLIBCSzHashSetValue"}) {
        rig.fail(operation);
        EXPECT_OUTCOME(
            set(anonymous("broker")),
            {.result = -1, .code = 0x200, .unit = kUnit, .log = {"ERR tunnel_config_get:N failed to alloc hash"}});
    }
    EXPECT_EQ("<absent>", read_file(kFile));
}

TEST_F(tunnel_config_get, KOVATunnelConfigSet_storedAccountThatCannotBeRead_isTold) {
    write_file(kFile, "LOGIN=login\nSERVER=broker\n");
    write_file(kPassword, enciphered(long_text(40)));
    EXPECT_OUTCOME(set(account("other", "user", "secret")),
                   {.result = -1,
                    .log = {"ERR tunnel_config_get TunnelPasswdGet(N): lenPasswdEnc is not enough!!",
                            "ERR tunnel_config_get:N failed to get Tunnel Config"}});
    EXPECT_EQ("LOGIN=login\nSERVER=broker\n", read_file(kFile));
    write_file(kPassword, "");
    EXPECT_OUTCOME(set(account("broker", "", "secret")),
                   {.result = 0, .log = {"INFO tunnel_config_get:N file /etc/gogoc/.tunnel_passwd is empty"}});
    EXPECT_EQ(enciphered("secret"), read_file(kPassword)) << "repaired";
}

TEST_F(tunnel_config_get, KOVATunnelConfigSet_runKey_isNoMatterOfTheAccount) {
    shell("rm " + kRun);
    EXPECT_OUTCOME(set(account("broker", "user", "secret")), {.result = 0});
}

TEST_F(tunnel_config_get, KOVATunnelConfigSet_badArguments_areRefusedBeforeAnythingIsWritten) {
    EXPECT_OUTCOME(rig.observe([] { return KOVATunnelConfigSet(nullptr); }), refusal(kUnit, "NULL != pConf"));
    EXPECT_OUTCOME(rig.observe([] { return KOVATunnelConfigGet(nullptr); }), refusal(kUnit, "NULL != pConf"));
    EXPECT_OUTCOME(set(anonymous(long_text(256))), refusal(kUnit, "is_one_line(pConf->szServer)"));
    EXPECT_OUTCOME(set(account("s", long_text(256), "p")), refusal(kUnit, "is_one_line(pConf->szUserId)"));
    for (const std::string end : {"\n", "\r", "\nLOGIN=x"}) {
        EXPECT_OUTCOME(set(account("s" + end, "u", "p")), refusal(kUnit, "is_one_line(pConf->szServer)"));
        EXPECT_OUTCOME(set(account("s", "u" + end, "p")), refusal(kUnit, "is_one_line(pConf->szUserId)"));
        EXPECT_OUTCOME(set(account("s", "u", "p" + end)), refusal(kUnit, "is_one_line(pConf->szPassword)"));
    }
    EXPECT_EQ("<absent>", read_file(kFile));
    EXPECT_EQ(texts{}, list_dir("/etc/gogoc"));
}
