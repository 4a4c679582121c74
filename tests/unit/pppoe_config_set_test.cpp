#include "support/rig.h"

#include <algorithm>
#include <cstring>
#include <kovanetsdk/pppoe.h>
#include <sys/stat.h>

using namespace kova_test;

namespace {

const std::string kUnit = "pppoe_config_set";
const std::string kConf = "/etc/ppp/pppoe.conf";
const std::string kSecrets = "/etc/ppp/pap-secrets";
const std::string kNewSecrets = kSecrets + ".tmp";

PPPOE_CONF settings(const std::string &user, const std::string &password, const std::string &ifname = "eth0",
                    const std::string &mtu = "1492", uint32_t is_default = 1) {
    PPPOE_CONF conf = {};
    memcpy(conf.szIfname, ifname.data(), std::min(ifname.size(), sizeof conf.szIfname));
    memcpy(conf.szUser, user.data(), std::min(user.size(), sizeof conf.szUser));
    memcpy(conf.szPassword, password.data(), std::min(password.size(), sizeof conf.szPassword));
    memcpy(conf.szMTU, mtu.data(), std::min(mtu.size(), sizeof conf.szMTU));
    conf.blDefaultRoute = is_default;
    return conf;
}

/** A user name as both files have it. */
std::string quoted(const std::string &user) {
    std::string text = "'";
    for (const char byte : user) {
        if (text.size() > (byte == '\'' ? 505U : 509U)) {
            break;
        }
        text += byte == '\'' ? std::string("'\"'\"'") : std::string(1, byte);
    }
    return text + "'";
}

} // namespace

class pppoe_config_set : public unit_test {
protected:
    outcome set(const PPPOE_CONF &conf) {
        return rig.observe([&] { return PPPoEConfigSet(&conf); });
    }
    outcome get() {
        memset(&read, 'u', sizeof read);
        return rig.observe([this] { return PPPoEConfigGet(&read); });
    }
    void expect_read(const PPPOE_CONF &expected) const {
        EXPECT_STREQ(expected.szIfname, read.szIfname);
        EXPECT_STREQ(expected.szUser, read.szUser);
        EXPECT_STREQ(expected.szPassword, read.szPassword);
        EXPECT_STREQ(expected.szMTU, read.szMTU);
        EXPECT_EQ(expected.blDefaultRoute != 0 ? 1U : 0U, read.blDefaultRoute);
    }

    PPPOE_CONF read;
};

// ---- storing

TEST_F(pppoe_config_set, PPPoEConfigSet_settings_areInBothFiles) {
    EXPECT_OUTCOME(set(settings("a'b", "secret")), {.result = 0});
    EXPECT_EQ("ETH=eth0\nDEFAULTROUTE=yes\nUSER='a'\"'\"'b'\nMTU=1492\n", read_file(kConf));
    EXPECT_EQ("'a'\"'\"'b'\t*\tsecret\n", read_file(kSecrets));
    EXPECT_EQ((texts{"pap-secrets", "pppoe.conf"}), list_dir("/etc/ppp"));
    EXPECT_EQ(0600U, mode_of(kSecrets));
}

TEST_F(pppoe_config_set, PPPoEConfigSet_otherKeysStay_otherSecretsGo) {
    write_file(kConf, "# mine\nMTU=1\nDEMAND=no\nETH=eth1");
    write_file(kSecrets, "'other'\t*\tpassword\n");
    EXPECT_OUTCOME(set(settings("user", "secret", "eth0", "1492", 0)), {.result = 0});
    EXPECT_EQ("# mine\nMTU=1492\nDEMAND=no\nETH=eth0\nDEFAULTROUTE=no\nUSER='user'\n", read_file(kConf));
    EXPECT_EQ("'user'\t*\tsecret\n", read_file(kSecrets));
}

TEST_F(pppoe_config_set, PPPoEConfigSet_userThatIsTooLongWithItsQuotes_isCut) {
    const std::string quote = "'\"'\"'";
    std::string hundred_and_one;
    for (int i = 0; i < 101; ++i) {
        hundred_and_one += quote;
    }
    EXPECT_EQ(0, set(settings(long_text(255, '\''), "p")).result);
    EXPECT_EQ("'" + hundred_and_one + "'\t*\tp\n", read_file(kSecrets));
    // 100 quotes and the opening one make 501; nine bytes more reach 510, where only the closing one has room
    std::string hundred;
    for (int i = 0; i < 100; ++i) {
        hundred += quote;
    }
    EXPECT_EQ(0, set(settings(long_text(100, '\'') + long_text(20, 'x'), "p")).result);
    EXPECT_EQ("'" + hundred + long_text(9, 'x') + "'\t*\tp\n", read_file(kSecrets));
    EXPECT_EQ(0, set(settings(long_text(100, '\'') + "xxxx'y", "p")).result);
    EXPECT_EQ("'" + hundred + "xxxx" + quote + "'\t*\tp\n", read_file(kSecrets));
    EXPECT_EQ(0, set(settings(long_text(100, '\'') + "xxxxx'y", "p")).result);
    EXPECT_EQ("'" + hundred + "xxxxx'\t*\tp\n", read_file(kSecrets)) << "cut there, not picked over";
}

TEST_F(pppoe_config_set, PPPoEConfigSet_secret_isNobodyElsesFromTheBeginning) {
    ASSERT_EQ(0, set(settings("user", "secret")).result);
    shell("rm " + kSecrets);
    const mode_t old = umask(0);
    rig.fail("chmod");
    EXPECT_OUTCOME(set(settings("user", "secret")),
                   {.result = -1, .log = {"ERR pppoe_config_set:N chmod /etc/ppp/pap-secrets failed"}});
    EXPECT_EQ(0600U, mode_of(kSecrets)) << "the mode it was made with";
    umask(old);
    shell("chmod 666 " + kSecrets);
    EXPECT_EQ(0, set(settings("user", "secret")).result);
    EXPECT_EQ(0600U, mode_of(kSecrets));
}

TEST_F(pppoe_config_set, PPPoEConfigSet_secret_isNobodyElsesAtAnyMoment) {
    const mode_t old = umask(0);
    for (const bool is_there : {false, true}) {
        if (is_there) {
            shell("chmod 666 " + kSecrets + " " + kConf);
            write_file(kNewSecrets, "left by a killed one\n");
            shell("chmod 666 " + kNewSecrets);
        }
        texts seen;
        const auto look = [&seen](const std::string &at) {
            for (const std::string &path : {kNewSecrets, kSecrets}) {
                if (read_file(path).find("secret") != std::string::npos) {
                    seen.push_back(at + (mode_of(path) == 0600U ? " closed" : " open"));
                }
            }
        };
        rig.before("fsync", [&look] { look("fsync"); });
        rig.before("fclose", [&look] { look("fclose"); });
        rig.before("rename", [&look] { look("rename"); });
        rig.before("chmod", [&look] { look("chmod"); });
        rig.made.clear();
        EXPECT_EQ(0, set(settings("user", "secret")).result);
        EXPECT_EQ(0600U, rig.made.at(kNewSecrets));
        EXPECT_EQ(0U, rig.made.count(kSecrets));
        EXPECT_EQ(0600U, mode_of(kSecrets));
        EXPECT_NE(seen.end(), std::find(seen.begin(), seen.end(), "rename closed"));
        EXPECT_NE(seen.end(), std::find(seen.begin(), seen.end(), "chmod closed"));
        for (const std::string &moment : seen) {
            EXPECT_EQ(std::string::npos, moment.find("open")) << moment;
        }
        shell("printf old > " + kSecrets);
    }
    umask(old);
}

TEST_F(pppoe_config_set, PPPoEConfigSet_linkInPlaceOfTheSecrets_isReplaced) {
    write_file("/tmp/bait", "bait\n");
    shell("chmod 644 /tmp/bait && ln -s /tmp/bait " + kSecrets);
    EXPECT_EQ(0, set(settings("user", "secret")).result);
    EXPECT_EQ("bait\n", read_file("/tmp/bait"));
    EXPECT_EQ(0644U, mode_of("/tmp/bait"));
    EXPECT_EQ(0600U, mode_of(kSecrets));
    shell("test -f " + kSecrets + " -a ! -L " + kSecrets + " && rm /tmp/bait");
}

TEST_F(pppoe_config_set, PPPoEConfigSet_placesThatCannotBeWritten_keepWhatIsThere) {
    const texts edit{"ERR pppoe_config_set (N) Failed to edit /etc/ppp/pppoe.conf"};
    ASSERT_EQ(0, set(settings("user", "old")).result);
    const std::string conf = read_file(kConf);
    const std::string secrets = read_file(kSecrets);
    shell("cp -a /etc/ppp /tmp/ppp && mount -t tmpfs tmpfs /etc/ppp && cp -a /tmp/ppp/. /etc/ppp && "
          "mount -o remount,ro /etc/ppp");
    const outcome got = set(settings("other", "new"));
    EXPECT_EQ(-1, got.result);
    EXPECT_EQ(edit, got.log);
    EXPECT_EQ(conf, read_file(kConf));
    EXPECT_EQ(secrets, read_file(kSecrets));
    shell("umount /etc/ppp && rm -r /tmp/ppp");
    for (const char *break_it : {"rm /etc/ppp/pppoe.conf && mkdir /etc/ppp/pppoe.conf", "rm -r /etc/ppp"}) {
        shell(break_it);
        EXPECT_EQ(edit, set(settings("other", "new")).log);
    }
    EXPECT_EQ("<absent>", read_file(kSecrets));
    shell("mkdir /etc/ppp");
}

TEST_F(pppoe_config_set, PPPoEConfigSet_temporaryThatIsThere_isNotWrittenInto) {
    write_file("/tmp/bait", "bait\n");
    shell("ln -s /tmp/bait " + kNewSecrets);
    EXPECT_EQ(0, set(settings("user", "secret")).result);
    EXPECT_EQ("bait\n", read_file("/tmp/bait"));
    write_file(kNewSecrets, "left by a killed one\n");
    shell("chmod 666 " + kNewSecrets + " && ln " + kNewSecrets + " /etc/ppp/still-open");
    EXPECT_EQ(0, set(settings("user", "secret")).result);
    EXPECT_EQ("left by a killed one\n", read_file("/etc/ppp/still-open"));
    EXPECT_EQ(0600U, mode_of(kSecrets));
    shell("rm /etc/ppp/still-open /tmp/bait");
}

TEST_F(pppoe_config_set, PPPoEConfigSet_keyThatCannotBeWritten_stopsThere) {
    const texts kept{"<absent>", "ETH=eth0\n", "ETH=eth0\nDEFAULTROUTE=yes\n",
                     "ETH=eth0\nDEFAULTROUTE=yes\nUSER='u'\n"};
    for (int nth = 1; nth <= 4; ++nth) {
        shell("rm -f " + kConf);
        rig.fail("KLIBCFileSetKeyValue", nth);
        EXPECT_OUTCOME(set(settings("u", "secret")),
                       {.result = -1,
                        .code = 0xB00,
                        .unit = "platform",
                        .log = {"ERR pppoe_config_set (N) Failed to edit /etc/ppp/pppoe.conf"}});
        EXPECT_EQ(kept[static_cast<size_t>(nth) - 1], read_file(kConf));
        EXPECT_EQ("<absent>", read_file(kSecrets));
    }
}

TEST_F(pppoe_config_set, PPPoEConfigSet_secretThatCannotBeStored_leavesTheOldOne) {
    ASSERT_EQ(0, set(settings("user", "old")).result);
    rig.fail("fsync"); // the other file stays as it is and is not written
    EXPECT_OUTCOME(
        set(settings("user", "new")),
        {.result = -1, .log = {"ERR pppoe_config_set (N) Failed to fflush PPPoE setting.(Input/output error)"}});
    EXPECT_EQ("'user'\t*\told\n", read_file(kSecrets));
    EXPECT_EQ((texts{"pap-secrets", "pppoe.conf"}), list_dir("/etc/ppp")) << "no secret is left lying about";
    shell("mkdir " + kNewSecrets);
    EXPECT_OUTCOME(set(settings("user", "new")),
                   {.result = -1,
                    .log = {"ERR pppoe_config_set (N) Failed to open tmp file to write PPPoE setting (File exists)"}});
    EXPECT_EQ("'user'\t*\told\n", read_file(kSecrets));
    shell("rmdir " + kNewSecrets + " && rm " + kSecrets + " && mkdir " + kSecrets);
    EXPECT_OUTCOME(set(settings("user", "new")),
                   {.result = -1,
                    .log = {"ERR pppoe_config_set:N rename /etc/ppp/pap-secrets to /etc/ppp/pap-secrets.tmp failed"}});
    EXPECT_EQ("<absent>", read_file(kNewSecrets));
}

TEST_F(pppoe_config_set, PPPoEConfigSet_badArguments_areRefusedBeforeAnythingIsWritten) {
    EXPECT_OUTCOME(rig.observe([] { return PPPoEConfigSet(nullptr); }), refusal(kUnit, "NULL != pConf"));
    EXPECT_OUTCOME(set(settings("u", "p", long_text(16))), refusal(kUnit, "is_one_line(pConf->szIfname)"));
    EXPECT_OUTCOME(set(settings(long_text(256), "p")), refusal(kUnit, "is_one_line(pConf->szUser)"));
    EXPECT_OUTCOME(set(settings("u", long_text(32))), refusal(kUnit, "is_one_line(pConf->szPassword)"));
    EXPECT_OUTCOME(set(settings("u", "p", "eth0", long_text(8))), refusal(kUnit, "is_one_line(pConf->szMTU)"));
    for (const char *end : {"\n", "\r"}) {
        EXPECT_OUTCOME(set(settings("u", "p", std::string("eth0") + end)),
                       refusal(kUnit, "is_one_line(pConf->szIfname)"));
        EXPECT_OUTCOME(set(settings(std::string("u") + end + "'root'", "p")),
                       refusal(kUnit, "is_one_line(pConf->szUser)"));
        EXPECT_OUTCOME(set(settings("u", std::string("p") + end + "'root'\t*\tp")),
                       refusal(kUnit, "is_one_line(pConf->szPassword)"));
        EXPECT_OUTCOME(set(settings("u", "p", "eth0", end)), refusal(kUnit, "is_one_line(pConf->szMTU)"));
    }
    EXPECT_EQ(texts{}, list_dir("/etc/ppp"));
}

// ---- reading

TEST_F(pppoe_config_set, PPPoEConfigGet_whatWasStored_isReadAndStoringItChangesNothing) {
    const texts users{"",
                      "u",
                      "a'b",
                      "''",
                      "user@isp.example",
                      " blanks around ",
                      "tab\tin",
                      "a*b",
                      "*",
                      "\"x\"",
                      "'\"'",
                      "#hash",
                      "back\\slash",
                      "a=b",
                      "%s%n",
                      "\x01\x7f",
                      "\xc3\xbc",
                      long_text(254),
                      long_text(255),
                      long_text(101, '\'')};
    const texts passwords{
        "",         "p",           "a*b",   "*",    "in side", "'quoted'",          "\"q\"",
        "#hash",    "a\\nb\\",     "%s",    "\x01", "a\tb",    long_text(30),       long_text(31),
        "\xc3\xbc", "\x7f\x1b[0m", "* * *", "it's", "a\"b",    long_text(31, '\''), long_text(31, '*')};
    for (const std::string &user : users) {
        for (const std::string &password : passwords) {
            SCOPED_TRACE(user + " " + password);
            const PPPOE_CONF stored = settings(user, password);
            ASSERT_EQ(0, set(stored).result);
            EXPECT_OUTCOME(get(), {.result = 0});
            expect_read(stored);
            const std::string files = read_file(kConf) + read_file(kSecrets);
            EXPECT_EQ(0, set(read).result);
            EXPECT_EQ(files, read_file(kConf) + read_file(kSecrets));
        }
    }
}

TEST_F(pppoe_config_set, PPPoEConfigGet_textsOfEveryLength_areReadAsStored) {
    for (size_t length = 0; length <= 255; ++length) {
        const std::string password = long_text(length % 32, 'p');
        ASSERT_EQ(0, set(settings(long_text(length, 'u'), password)).result);
        ASSERT_EQ(quoted(long_text(length, 'u')) + "\t*\t" + password + "\n", read_file(kSecrets)) << length;
        EXPECT_OUTCOME(get(), {.result = 0});
        expect_read(settings(long_text(length, 'u'), password));
    }
}

TEST_F(pppoe_config_set, PPPoEConfigGet_quotesAroundTheBound_areCutAlikeInBothFiles) {
    for (size_t quotes = 99; quotes <= 103; ++quotes) {
        for (size_t others = 0; others <= 16; ++others) {
            const std::string user = long_text(quotes, '\'') + long_text(others, 'u') + "'z";
            const std::string expected = quoted(user);
            ASSERT_LE(expected.size(), 511U);
            ASSERT_EQ(0, set(settings(user, "p")).result);
            ASSERT_EQ(expected + "\t*\tp\n", read_file(kSecrets)) << quotes << " " << others;
            ASSERT_EQ("ETH=eth0\nDEFAULTROUTE=yes\nUSER=" + expected + "\nMTU=1492\n", read_file(kConf));
            EXPECT_OUTCOME(get(), {.result = 0});
            EXPECT_EQ(0U, user.find(read.szUser)) << "its beginning";
            EXPECT_STREQ("p", read.szPassword);
        }
    }
}

TEST_F(pppoe_config_set, PPPoEConfigGet_blanksAroundAPassword_areNotPartOfIt) {
    for (const char *password : {" p", "p ", "\tp\t", "  p  "}) {
        ASSERT_EQ(0, set(settings("u", password)).result);
        EXPECT_EQ(std::string("'u'\t*\t") + password + "\n", read_file(kSecrets)) << "as given";
        EXPECT_OUTCOME(get(), {.result = 0});
        EXPECT_STREQ("p", read.szPassword);
    }
    ASSERT_EQ(0, set(settings("u", " \t ")).result);
    EXPECT_OUTCOME(get(), {.result = 0});
    EXPECT_STREQ("", read.szPassword);
}

TEST_F(pppoe_config_set, PPPoEConfigGet_foreignUsers_areUnquoted) {
    write_file(kSecrets, "me * p\n");
    for (const char *user : {"me", "'me'", "\"me\"", "'me", "me'", "m'e'", "'m'\"e\"", "'me'\r"}) {
        write_file(kConf, std::string("ETH=eth0\nUSER=") + user + "\nMTU=1492");
        EXPECT_OUTCOME(get(), {.result = 0});
        expect_read(settings("me", "p", "eth0", "1492", 0));
    }
}

TEST_F(pppoe_config_set, PPPoEConfigGet_cutUser_isReadAsCut) {
    ASSERT_EQ(0, set(settings(long_text(255, '\''), "p")).result);
    EXPECT_EQ(0, get().result);
    expect_read(settings(long_text(101, '\''), "p"));
}

TEST_F(pppoe_config_set, PPPoEConfigGet_fieldsOfAllLengths_areWholeOrCut) {
    ASSERT_EQ(0, set(settings("u", "p", long_text(15), "1234567", 7)).result);
    EXPECT_EQ(0, get().result);
    expect_read(settings("u", "p", long_text(15), "1234567"));
    write_file(kConf, "ETH=" + long_text(40) + "\nUSER=" + long_text(300, 'u') + "\nMTU=" + long_text(40, '1') + "\n");
    write_file(kSecrets, long_text(300, 'u') + " * " + long_text(40, 'p') + "\n");
    EXPECT_EQ(0, get().result);
    expect_read(settings(long_text(255, 'u'), long_text(31, 'p'), long_text(15), long_text(7, '1'), 0));
}

TEST_F(pppoe_config_set, PPPoEConfigGet_linesOfOthers_arePassedOver) {
    write_file(kConf, "ETH=eth0\nUSER='me'\nMTU=1492\n");
    const texts lines{"'me'\t*\tp\n",
                      "me * p\n",
                      "\"me\"*p",
                      "  me \t*\t p \t\r\n",
                      "# me * comment\n\n'you'\t*\tq\nmeme * q\nm * q\n'me' q\nme\n*\n* me *\n'me'\t*\tp\n",
                      "'me\t*\tq\n'me'\t*\tp\n",
                      "'m'e * p\n'me'\t*\tsecond\n",
                      long_text(100000) + "\nme * p\n",
                      std::string("\0\xff\n", 3) + "me * p\n"};
    for (const std::string &content : lines) {
        write_file(kSecrets, content);
        EXPECT_OUTCOME(get(), {.result = 0});
        EXPECT_STREQ("p", read.szPassword) << content.substr(0, 100);
    }
}

TEST_F(pppoe_config_set, PPPoEConfigGet_noLineForTheUser_isAnEmptyPassword) {
    write_file(kConf, "ETH=eth0\nUSER='me'\nMTU=1492\n");
    // the last ones are cut off where the password should be, or before
    for (const char *content : {"", "\n", "'you'\t*\tq\n", "'me'\tq\n", "'ME'\t*\tq\n", "'me'\t*\t", "'me'\t*",
                                "'me'\t", "'me'", "'me", "'", "*", "\t*\tq\n", "''\t*\tq\n"}) {
        write_file(kSecrets, content);
        EXPECT_OUTCOME(get(), {.result = 0});
        expect_read(settings("me", "", "eth0", "1492", 0));
    }
}

TEST_F(pppoe_config_set, PPPoEConfigGet_noUser_isTheEndOfIt) {
    write_file(kConf, "ETH=eth0\nDEFAULTROUTE=yes\nMTU=1492\n");
    EXPECT_OUTCOME(get(), {.result = 0});
    expect_read(settings("", "", "eth0", ""));
    write_file(kConf, "");
    EXPECT_OUTCOME(get(), {.result = 0});
    expect_read(settings("", "", "", "", 0));
}

TEST_F(pppoe_config_set, PPPoEConfigGet_defaultRoute_isExactlyYes) {
    for (const char *value : {"no", "YES", "", "yes ", "1"}) {
        write_file(kConf, std::string("DEFAULTROUTE=") + value + "\n");
        EXPECT_EQ(0, get().result);
        EXPECT_EQ(0U, read.blDefaultRoute) << value;
    }
    write_file(kConf, "DEFAULTROUTE=\"yes\"\n");
    EXPECT_EQ(0, get().result);
    EXPECT_EQ(1U, read.blDefaultRoute);
}

TEST_F(pppoe_config_set, PPPoEConfigGet_fileThatCannotBeRead_fails) {
    EXPECT_OUTCOME(get(), {.result = -1,
                           .code = 0x900,
                           .unit = "key_value",
                           .log = {"ERR pppoe_config_set:N Failed to get PPPoE ETH setting.[0x0900 key_value:N]"}});
    write_file(kConf, "ETH=eth0\nUSER='me'\nMTU=1492\n");
    rig.fail("KLIBCFileGetKeyValue", 3);
    EXPECT_OUTCOME(get(), {.result = -1,
                           .code = 0x900,
                           .unit = "platform",
                           .log = {"ERR pppoe_config_set:N Failed to get PPPoE MTU setting."}});
    EXPECT_OUTCOME(get(), {.result = -1, .log = {"ERR pppoe_config_set (N) Failed to open /etc/ppp/pap-secrets"}});
    rig.fail("KLIBCFileGetKeyValue", 2);
    EXPECT_OUTCOME(get(), {.result = -1,
                           .code = 0x900,
                           .unit = "platform",
                           .log = {"ERR pppoe_config_set:N Failed to get PPPoE USER setting."}});
    shell("mkdir " + kSecrets); // opens, and cannot be read
    EXPECT_OUTCOME(get(), {.result = -1, .log = {"ERR pppoe_config_set (N) Failed to read /etc/ppp/pap-secrets"}});
}

TEST_F(pppoe_config_set, PPPoEConfigGet_noRecord_isLogged) {
    EXPECT_OUTCOME(rig.observe([] { return PPPoEConfigGet(nullptr); }),
                   {.result = -1,
                    .code = 0xD00,
                    .unit = "pppoe_config_set",
                    .log = {"ERR pppoe_config_set (N) bad parameter PPPoEConf"}});
}
