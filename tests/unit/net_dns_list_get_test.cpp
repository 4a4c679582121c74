#include "support/resolver.h"

#include <sys/wait.h>
#include <unistd.h>

using namespace kova_test;

namespace {

struct reader {
    const char *name;
    int (*get)(KLIBSZLIST **);
    std::string file;
    texts locks;
};

const reader kReaders[] = {
    {"KOVANetDNSListGet", KOVANetDNSListGet, kResolvConf, {"+0x105", "-0x100"}},
    {"KOVANetStaticDNSListGet", KOVANetStaticDNSListGet, kStaticConf, {}},
};

class net_dns_list_get : public resolver_test {
protected:
    /** The servers that both readers find in a file of this content. */
    texts servers_in(const std::string &content) {
        texts found[2];
        for (size_t i = 0; i < 2; ++i) {
            const reader &one = kReaders[i];
            write_file(one.file, content);
            text_list list;
            EXPECT_OUTCOME(rig.observe([&] { return one.get(list.out()); }), {.locks = one.locks});
            found[i] = list.items();
        }
        EXPECT_EQ(found[0], found[1]);
        return found[0];
    }
    /** A call on no list gives back a lock that it has not taken. */
    outcome call_without_list(const reader &one, KLIBSZLIST **list) {
        const outcome got = rig.observe([&] { return one.get(list); });
        rig.held["named locks"] = 0;
        return got;
    }
    static outcome refusal_of(const reader &one, const std::string &condition) {
        outcome expected = refusal("net_dns_list_get", condition);
        expected.locks = one.locks.empty() ? texts{} : texts{"-0x100"};
        return expected;
    }
};

TEST_F(net_dns_list_get, readers_servers_areAppendedInOrder) {
    for (const reader &one : kReaders) {
        write_file(one.file, "nameserver\t10.0.0.1\nnameserver\tfe80::1\ndomain\texample\n");
        text_list list{{"9.9.9.9"}};
        EXPECT_OUTCOME(rig.observe([&] { return one.get(list.out()); }), {.locks = one.locks});
        EXPECT_EQ((texts{"9.9.9.9", "10.0.0.1", "fe80::1"}), list.items()) << one.name;
    }
}

TEST_F(net_dns_list_get, readers_lines_areSplitAtEachSeparator) {
    EXPECT_EQ((texts{"10.0.0.1"}), servers_in("nameserver 10.0.0.1"));
    EXPECT_EQ((texts{"10.0.0.1"}), servers_in("nameserver\t10.0.0.1 # a comment\n"));
    EXPECT_EQ((texts{""}), servers_in("nameserver\n"));
    EXPECT_EQ((texts{""}), servers_in("nameserver \t10.0.0.1\n"));
    EXPECT_EQ((texts{""}), servers_in("nameserver10.0.0.1\n"));
    EXPECT_EQ((texts{"second"}), servers_in("nameservers second third\n"));
    EXPECT_EQ((texts{"10.0.0.1\r"}), servers_in("nameserver 10.0.0.1\r\n"));
    EXPECT_EQ((texts{}), servers_in("nameserver"));
    EXPECT_EQ((texts{}), servers_in("nameserver10.0.0.1"));
    EXPECT_EQ((texts{}), servers_in(" nameserver\t10.0.0.1\n#nameserver\t10.0.0.1\nNAMESERVER\t10.0.0.1\n\nname\n"));
    EXPECT_EQ((texts{}), servers_in(""));
}

TEST_F(net_dns_list_get, readers_longLines_areReadInPieces) {
    EXPECT_EQ((texts{long_text(500)}), servers_in("nameserver " + long_text(600) + "\n"));
    EXPECT_EQ((texts{"10.0.0.1"}), servers_in(long_text(511) + "nameserver\t10.0.0.1\n"));
    EXPECT_EQ((texts{}), servers_in(long_text(512) + "nameserver\t10.0.0.1\n"));
    EXPECT_EQ((texts{"10.0.0.1"}), servers_in(long_text(1000000) + "\nnameserver\t10.0.0.1\n"));
}

TEST_F(net_dns_list_get, readers_binaryData_isNoServer) {
    std::string bytes;
    for (int i = 0; i < 100000; ++i) {
        bytes += static_cast<char>(i * 7919 >> 3);
    }
    EXPECT_EQ((texts{"10.0.0.1"}), servers_in(bytes + "\nnameserver\t10.0.0.1\n"));
    using namespace std::string_literals;
    EXPECT_EQ((texts{"10.0", "10.0.0.2"}), servers_in("nameserver\t10.0\0.0.1\nnameserver\t10.0.0.2\n"s));
}

TEST_F(net_dns_list_get, readers_tenThousandServers_areAllRead) {
    std::string content;
    texts expected;
    for (int i = 0; i < 10000; ++i) {
        expected.push_back("10.1." + std::to_string(i / 250) + "." + std::to_string(i % 250));
        content += "nameserver\t" + expected.back() + "\n";
    }
    EXPECT_EQ(expected, servers_in(content));
}

TEST_F(net_dns_list_get, readers_missingFile_isNoServer) {
    for (const reader &one : kReaders) {
        text_list list{{"9.9.9.9"}};
        EXPECT_OUTCOME(rig.observe([&] { return one.get(list.out()); }),
                       {.log = {"INFO net_dns_list_get:N Failed to open " + one.file + ". (No such file or directory)"},
                        .locks = one.locks});
        EXPECT_EQ((texts{"9.9.9.9"}), list.items());
    }
}

TEST_F(net_dns_list_get, readers_fileThatCannotBeOpened_isNoServer) {
    for (const reader &one : kReaders) {
        write_file(one.file, "nameserver\t10.0.0.1\n");
        text_list list;
        rig.fail("fopen");
        EXPECT_OUTCOME(rig.observe([&] { return one.get(list.out()); }),
                       {.log = {"INFO net_dns_list_get:N Failed to open " + one.file + ". (Too many open files)"},
                        .locks = one.locks});
        EXPECT_EQ((texts{}), list.items());
    }
}

TEST_F(net_dns_list_get, readers_directory_isNoServer) {
    for (const reader &one : kReaders) {
        std::filesystem::create_directory(one.file);
        text_list list;
        EXPECT_OUTCOME(rig.observe([&] { return one.get(list.out()); }), {.locks = one.locks});
        EXPECT_EQ((texts{}), list.items());
    }
}

TEST_F(net_dns_list_get, readers_noList_isRefused) {
    for (const reader &one : kReaders) {
        KLIBSZLIST *none = nullptr;
        EXPECT_OUTCOME(call_without_list(one, nullptr), refusal_of(one, "NULL != ppServers"));
        EXPECT_OUTCOME(call_without_list(one, &none), refusal_of(one, "NULL != *ppServers"));
    }
}

TEST_F(net_dns_list_get, readers_noMemory_keepsWhatIsRead) {
    for (const reader &one : kReaders) {
        write_file(one.file, "nameserver\t10.0.0.1\nnameserver\t10.0.0.2\n");
        text_list list;
        rig.fail("KLIBCSzListPush", 2);
        EXPECT_OUTCOME(rig.observe([&] { return one.get(list.out()); }),
                       {.result = -1,
                        .code = 0x200,
                        .unit = "platform",
                        .log = {"ERR net_dns_list_get:N Cannot push the list"},
                        .locks = one.locks});
        EXPECT_EQ((texts{"10.0.0.1"}), list.items());
    }
}

TEST_F(net_dns_list_get, KOVANetDNSListGet_lockNotHad_readsNothing) {
    write_file(kResolvConf, "nameserver\t10.0.0.1\n");
    rig.fail("KLIBCFileLock");
    text_list list;
    const outcome got = rig.observe([&] { return KOVANetDNSListGet(list.out()); });
    rig.held["named locks"] = 0; // given back without having been taken
    EXPECT_OUTCOME(got, {.result = -1,
                         .code = 0x400,
                         .unit = "net_dns_list_get",
                         .log = {"ERR net_dns_list_get:N KLIBCFileLock() failed.(400)"},
                         .locks = {"-0x100"}});
    EXPECT_EQ((texts{}), list.items());
}

TEST_F(net_dns_list_get, KOVANetStaticDNSListGet_lockOfAWriter_isNotWaitedFor) {
    const lock_elsewhere writer{0x106};
    write_file(kStaticConf, "nameserver\t10.0.0.1\n");
    text_list list;
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetStaticDNSListGet(list.out()); }), {});
    EXPECT_EQ((texts{"10.0.0.1"}), list.items());
}

TEST_F(net_dns_list_get, KOVANetDNSListGet_underALockOfItsCaller_leavesThatHeld) {
    write_file(kResolvConf, "nameserver\t10.0.0.1\n");
    ASSERT_EQ(0, KLIBCFileLock(0x106, 5));
    text_list list;
    EXPECT_OUTCOME(rig.observe([&] { return KOVANetDNSListGet(list.out()); }), {.locks = {"+0x105", "-0x100"}});
    const pid_t other = fork();
    if (other == 0) {
        _exit(KLIBCFileLock(0x105, 0) == 0 ? 1 : 0);
    }
    int status = -1;
    waitpid(other, &status, 0);
    EXPECT_EQ(0, status) << "another process can take the lock";
    KLIBCFileUnlock(0x100);
}

} // namespace
