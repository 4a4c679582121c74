#include "platform_test.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

using namespace kova_test;

namespace {

constexpr const char *kQuoted = "%s=\"%s\"\n";
constexpr const char *kPlain = "%s=%s\n";

class key_value : public platform_test {
protected:
    const std::string file_ = path("ifcfg-eth0");
    const char *name() const { return file_.c_str(); }

    /** @return "<result> <value>" */
    std::string get(const char *key, int size = 64) const {
        char value[4096] = "before";
        const int result = KLIBCFileGetKeyValue(name(), key, value, size, 0);
        return std::to_string(result > 0 ? 1 : result < 0 ? -1 : 0) + " " + value;
    }
};

class map {
public:
    map(std::initializer_list<std::pair<const char *, const char *>> entries) {
        for (const auto &[key, value] : entries)
            EXPECT_EQ(KLIBCSzHashSetValue(map_, key, value), 0);
    }
    ~map() { KLIBCSzHashFree(map_); }
    map(const map &) = delete;
    map &operator=(const map &) = delete;
    KLIBSZHASH *get() const { return map_; }

private:
    KLIBSZHASH *map_ = KLIBCSzHashAlloc(4);
};

} // namespace

TEST_F(key_value, KLIBCFileGetKeyValue_everyFormOfValue_isRead) {
    write_file(file_,
               "# comment\nA=plain\nB=\"quoted\"\nC=\nD=\"\"\nE=\"one\nF=in\"side\"\nG=\" x \"\r\n H=blank\nI =blank\n"
               "J=a=b\nK=\"\"twice\"\"\nL=\"\nM=last");
    EXPECT_EQ(get("A"), "1 plain");
    EXPECT_EQ(get("B"), "1 quoted");
    EXPECT_EQ(get("C"), "1 ");
    EXPECT_EQ(get("D"), "1 ");
    EXPECT_EQ(get("E"), "1 \"one");
    EXPECT_EQ(get("F"), "1 in\"side\"");
    EXPECT_EQ(get("G"), "1  x ");
    EXPECT_EQ(get("H"), "0 ");
    EXPECT_EQ(get("I"), "0 ");
    EXPECT_EQ(get("J"), "1 a=b");
    EXPECT_EQ(get("K"), "1 \"twice\"");
    EXPECT_EQ(get("L"), "1 \"");
    EXPECT_EQ(get("M"), "1 last");
    EXPECT_EQ(get("a"), "0 ");
    EXPECT_EQ(get("# comment"), "0 ");
    EXPECT_EQ(KLIBCErrGet(), kMark);
}

TEST_F(key_value, KLIBCFileGetKeyValue_keyTwice_firstLineWins) {
    write_file(file_, "ADDRESS=9\nADDR=1\nADDR=2\n");
    EXPECT_EQ(get("ADDR"), "1 1");
}

TEST_F(key_value, KLIBCFileGetKeyValue_shortBuffer_valueIsCut) {
    write_file(file_, "A=\"12345\"\n");
    EXPECT_EQ(get("A", 6), "1 12345");
    EXPECT_EQ(get("A", 5), "1 1234");
    EXPECT_EQ(get("A", 1), "1 ");
}

TEST_F(key_value, KLIBCFileGetKeyValue_missingFile_fails) {
    char value[8] = "x";
    EXPECT_FAILS(KLIBCFileGetKeyValue(name(), "A", value, sizeof value, 0), -1, 0x900);
    EXPECT_STREQ(value, "");
}

TEST_F(key_value, KLIBCFileGetKeyValue_directoryOrFifo_failsAtOnce) {
    char value[8];
    EXPECT_FAILS(KLIBCFileGetKeyValue(directory().c_str(), "A", value, sizeof value, 0), -1, 0x900);
    ASSERT_EQ(mkfifo(name(), 0644), 0);
    const double time =
        seconds_of([&] { EXPECT_FAILS(KLIBCFileGetKeyValue(name(), "A", value, sizeof value, 0), -1, 0x900); });
    EXPECT_LT(time, kDelay);
}

TEST_F(key_value, KLIBCFileGetKeyValue_badArguments_areRefused) {
    write_file(file_, "A=1\n");
    char value[8] = "x";
    EXPECT_FAILS(KLIBCFileGetKeyValue(nullptr, "A", value, 8, 0), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileGetKeyValue("", "A", value, 8, 0), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileGetKeyValue(name(), nullptr, value, 8, 0), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileGetKeyValue(name(), "", value, 8, 0), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileGetKeyValue(name(), "A", nullptr, 8, 0), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileGetKeyValue(name(), "A", value, 0, 0), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileGetKeyValue(name(), "A", value, 8, 1), -1, 0xD00);
    EXPECT_STREQ(value, "x");
}

TEST_F(key_value, KLIBCFileGetKeyValue_endlessLine_isPassedOver) {
    std::string text = "A=1\n" + std::string(300000, 'x') + "B=2\nB=3\n" + std::string(65536, 'y') +
                       "\nC=" + std::string(100000, 'z') + "\nD=4\n";
    write_file(file_, text);
    EXPECT_EQ(get("A"), "1 1");
    EXPECT_EQ(get("B"), "1 3");
    EXPECT_EQ(get("C", 5), "1 zzzz");
    EXPECT_EQ(get("D"), "1 4");
    EXPECT_EQ(get("E"), "0 ");
}

TEST_F(key_value, KLIBCFileGetKeyValue_binaryData_doesNoHarm) {
    std::string text(5000, '\0');
    for (size_t i = 0; i < text.size(); i++)
        text[i] = static_cast<char>(i * 7);
    write_file(file_, text + "\nA=1\n");
    EXPECT_EQ(get("A"), "1 1");
    write_file(file_, std::string{"A=1\0002\n", 7});
    EXPECT_EQ(get("A"), "1 1");
}

TEST_F(key_value, KLIBCFileGetKeyValue_linesAcrossBufferEnds_areRead) {
    std::string text;
    for (int i = 0; i < 20000; i++)
        text += "KEY" + std::to_string(i) + "=" + std::to_string(i * 3) + "\n";
    write_file(file_, text);
    for (int i = 0; i < 20000; i += 499) {
        EXPECT_EQ(get(("KEY" + std::to_string(i)).c_str()), "1 " + std::to_string(i * 3));
    }
}

TEST_F(key_value, KLIBCFileSetKeyValue_missingFile_isCreated) {
    umask(077);
    EXPECT_WORKS(KLIBCFileSetKeyValue(name(), "A", "1", kQuoted), 0);
    umask(022);
    EXPECT_EQ(read_file(file_), "A=\"1\"\n");
    struct stat status;
    ASSERT_EQ(stat(name(), &status), 0);
    EXPECT_EQ(status.st_mode, S_IFREG | 0644U);
    EXPECT_EQ(names_in(directory()), std::vector<std::string>{"ifcfg-eth0"});
}

TEST_F(key_value, KLIBCFileSetKeyValue_keyTwice_firstIsReplacedOthersGo) {
    write_file(file_, "# top\n\nA=1\nB=2\r\nAA=3\nA=\"4\"\nA =5\n\tA=6");
    EXPECT_WORKS(KLIBCFileSetKeyValue(name(), "A", "new", kPlain), 0);
    EXPECT_EQ(read_file(file_), "# top\n\nA=new\nB=2\r\nAA=3\nA =5\n\tA=6\n");
}

TEST_F(key_value, KLIBCFileSetKeyValue_lastLineWithoutNewline_getsOne) {
    write_file(file_, "A=1");
    EXPECT_WORKS(KLIBCFileSetKeyValue(name(), "B", "2", kQuoted), 0);
    EXPECT_EQ(read_file(file_), "A=1\nB=\"2\"\n");
}

TEST_F(key_value, KLIBCFileSetKeyValue_oddValue_isStoredVerbatim) {
    for (const char *value : {"", "mode=4 miimon=100 \"x\"", "%s%n", "\\n$HOME`id`", "\t \x01\xff", "=", "\"\""}) {
        EXPECT_WORKS(KLIBCFileSetKeyValue(name(), "BONDING_OPTS", value, kPlain), 0);
        EXPECT_EQ(read_file(file_), std::string{"BONDING_OPTS="} + value + "\n");
        EXPECT_WORKS(KLIBCFileSetKeyValue(name(), "BONDING_OPTS", value, kQuoted), 0);
        EXPECT_EQ(read_file(file_), std::string{"BONDING_OPTS=\""} + value + "\"\n");
        EXPECT_EQ(get("BONDING_OPTS"), std::string{"1 "} + value);
    }
}

TEST_F(key_value, KLIBCFileSetKeyValue_binaryLines_areKept) {
    const std::string other{"x\0y\xff\n", 5};
    write_file(file_, other + "A=1\n" + other + std::string(200000, 'z') + "\n");
    EXPECT_WORKS(KLIBCFileSetKeyValue(name(), "A", "2", kPlain), 0);
    EXPECT_EQ(read_file(file_), other + "A=2\n" + other + std::string(200000, 'z') + "\n");
}

TEST_F(key_value, KLIBCFileSetKeyValue_modeAndOwner_areKept) {
    write_file(file_, "A=1\n");
    if (chown(name(), 12, 34) != 0)
        GTEST_SKIP() << "no other user in this user namespace";
    chmod(name(), 04640);
    EXPECT_WORKS(KLIBCFileSetKeyValue(name(), "A", "2", kPlain), 0);
    struct stat status;
    ASSERT_EQ(stat(name(), &status), 0);
    EXPECT_EQ(status.st_mode, S_IFREG | 04640U);
    EXPECT_EQ(status.st_uid, 12U);
    EXPECT_EQ(status.st_gid, 34U);
}

TEST_F(key_value, KLIBCFileSetKeyValue_sameValue_writesNothing) {
    write_file(file_, "A=1\n");
    struct stat before;
    struct stat after;
    ASSERT_EQ(stat(name(), &before), 0);
    EXPECT_WORKS(KLIBCFileSetKeyValue(name(), "A", "1", kPlain), 0);
    ASSERT_EQ(stat(name(), &after), 0);
    EXPECT_EQ(before.st_ino, after.st_ino);
    EXPECT_WORKS(KLIBCFileSetKeyValue(name(), "A", "1", kQuoted), 0);
    ASSERT_EQ(stat(name(), &after), 0);
    EXPECT_NE(before.st_ino, after.st_ino);
}

TEST_F(key_value, KLIBCFileSetKeyValue_link_isFollowedAndKept) {
    write_file(path("real/target"), "A=1\n");
    ASSERT_EQ(symlink("real/target", name()), 0);
    EXPECT_WORKS(KLIBCFileSetKeyValue(name(), "A", "2", kPlain), 0);
    EXPECT_EQ(read_file(path("real/target")), "A=2\n");
    struct stat status;
    ASSERT_EQ(lstat(name(), &status), 0);
    EXPECT_TRUE(S_ISLNK(status.st_mode));
}

TEST_F(key_value, KLIBCFileSetKeyValue_linkToMissingFile_makesThatFile) {
    ASSERT_EQ(mkdir(path("real").c_str(), 0755), 0);
    ASSERT_EQ(symlink("real/target", name()), 0);
    EXPECT_WORKS(KLIBCFileSetKeyValue(name(), "A", "2", kPlain), 0);
    EXPECT_EQ(read_file(path("real/target")), "A=2\n");
    EXPECT_EQ(names_in(path("real")), std::vector<std::string>{"target"});
}

TEST_F(key_value, KLIBCFileSetKeyValue_linkInACircle_fails) {
    ASSERT_EQ(symlink("ifcfg-eth0", name()), 0);
    EXPECT_FAILS(KLIBCFileSetKeyValue(name(), "A", "2", kPlain), -1, 0x900);
}

TEST_F(key_value, KLIBCFileSetKeyValue_relativeAndOddPaths_meanTheSameFile) {
    const std::string old_directory = std::string{"/"};
    ASSERT_EQ(chdir(directory().c_str()), 0);
    EXPECT_WORKS(KLIBCFileSetKeyValue("ifcfg-eth0", "A", "1", kPlain), 0);
    EXPECT_WORKS(KLIBCFileSetKeyValue("./ifcfg-eth0", "B", "2", kPlain), 0);
    EXPECT_WORKS(KLIBCFileSetKeyValue((directory() + "//./ifcfg-eth0").c_str(), "C", "3", kPlain), 0);
    ASSERT_EQ(chdir(old_directory.c_str()), 0);
    EXPECT_EQ(read_file(file_), "A=1\nB=2\nC=3\n");
}

TEST_F(key_value, KLIBCFileSetKeyValue_longestFileName_works) {
    const std::string longest = path(std::string(255, 'n'));
    EXPECT_WORKS(KLIBCFileSetKeyValue(longest.c_str(), "A", "1", kPlain), 0);
    EXPECT_EQ(read_file(longest), "A=1\n");
    EXPECT_FAILS(KLIBCFileSetKeyValue((longest + "n").c_str(), "A", "1", kPlain), -1, 0x900);
    EXPECT_FAILS(KLIBCFileSetKeyValue(std::string(9000, '/').c_str(), "A", "1", kPlain), -1, 0x900);
}

TEST_F(key_value, KLIBCFileSetKeyValue_badArguments_changeNothing) {
    write_file(file_, "A=1\n");
    for (const char *key : {"", "=A", "A\nB", "A\r", "\x01"})
        EXPECT_FAILS(KLIBCFileSetKeyValue(name(), key, "2", kPlain), -1, 0xD00);
    for (const char *value : {"a\nb", "\n", "a\r"})
        EXPECT_FAILS(KLIBCFileSetKeyValue(name(), "A", value, kPlain), -1, 0xD00);
    for (const char *format : {"", "%s=%s", "%s: %s\n", "%s=%s\n%s", "%n%n\n"})
        EXPECT_FAILS(KLIBCFileSetKeyValue(name(), "A", "2", format), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileSetKeyValue(nullptr, "A", "2", kPlain), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileSetKeyValue("", "A", "2", kPlain), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileSetKeyValue(name(), nullptr, "2", kPlain), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileSetKeyValue(name(), "A", nullptr, kPlain), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileSetKeyValue(name(), "A", "2", nullptr), -1, 0xD00);
    EXPECT_EQ(read_file(file_), "A=1\n");
}

TEST_F(key_value, KLIBCFileSetKeyValue_missingDirectory_fails) {
    EXPECT_FAILS(KLIBCFileSetKeyValue(path("missing/file").c_str(), "A", "1", kPlain), -1, 0x900);
    EXPECT_TRUE(names_in(directory()).empty());
}

TEST_F(key_value, KLIBCFileSetKeys_twoMaps_setAndRemoveInOneRewrite) {
    write_file(file_, "DEVICE=eth0\nMASTER=bond0\n# kept\nSLAVE=yes\nIPADDR=1.1.1.1\nMASTER=again\n");
    const map set{{"IPADDR", "10.0.0.1"}, {"NETMASK", "255.0.0.0"}, {"DEVICE", "eth0"}, {"EMPTY", ""}};
    const map removed{{"MASTER", ""}, {"SLAVE", ""}, {"NONE", ""}};
    EXPECT_WORKS(KLIBCFileSetKeys(name(), set.get(), removed.get(), kPlain), 0);
    EXPECT_EQ(read_file(file_), "DEVICE=eth0\n# kept\nIPADDR=10.0.0.1\nNETMASK=255.0.0.0\nEMPTY=\n");
}

TEST_F(key_value, KLIBCFileSetKeys_keyInBothMaps_isSet) {
    write_file(file_, "A=1\nA=2\n");
    const map both{{"A", "3"}};
    EXPECT_WORKS(KLIBCFileSetKeys(name(), both.get(), both.get(), kQuoted), 0);
    EXPECT_EQ(read_file(file_), "A=\"3\"\n");
}

TEST_F(key_value, KLIBCFileSetKeys_missingMap_isEmpty) {
    const map some{{"B", "2"}, {"A", "1"}};
    EXPECT_WORKS(KLIBCFileSetKeys(name(), nullptr, nullptr, kPlain), 0);
    EXPECT_WORKS(KLIBCFileSetKeys(name(), nullptr, some.get(), kPlain), 0);
    EXPECT_EQ(read_file(file_), "(no file)");
    EXPECT_WORKS(KLIBCFileSetKeys(name(), some.get(), nullptr, kPlain), 0);
    EXPECT_EQ(read_file(file_), "B=2\nA=1\n");
    EXPECT_WORKS(KLIBCFileSetKeys(name(), nullptr, some.get(), kPlain), 0);
    EXPECT_EQ(read_file(file_), "");
}

TEST_F(key_value, KLIBCFileSetKeys_oneBadEntry_changesNothing) {
    write_file(file_, "A=1\n");
    const map bad_value{{"A", "2"}, {"B", "x\ny"}};
    const map bad_key{{"A", "2"}, {"=B", "x"}};
    EXPECT_FAILS(KLIBCFileSetKeys(name(), bad_value.get(), nullptr, kPlain), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileSetKeys(name(), bad_key.get(), nullptr, kPlain), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileSetKeys(name(), nullptr, bad_key.get(), kPlain), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileSetKeys(nullptr, bad_key.get(), nullptr, kPlain), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileSetKeys(name(), nullptr, nullptr, "%s"), -1, 0xD00);
    EXPECT_EQ(read_file(file_), "A=1\n");
}

TEST_F(key_value, KLIBCFileRemoveKey_keyTwice_everyLineGoes) {
    write_file(file_, "A=1\nAB=2\nA=\n#A=3\nA\nC=4\n");
    EXPECT_WORKS(KLIBCFileRemoveKey(name(), "A"), 0);
    EXPECT_EQ(read_file(file_), "AB=2\n#A=3\nA\nC=4\n");
}

TEST_F(key_value, KLIBCFileRemoveKey_absentKeyOrFile_isSuccess) {
    EXPECT_WORKS(KLIBCFileRemoveKey(name(), "A"), 0);
    EXPECT_WORKS(KLIBCFileRemoveKey(path("missing/file").c_str(), "A"), 0);
    EXPECT_TRUE(names_in(directory()).empty());
    write_file(file_, "B=1\n");
    EXPECT_WORKS(KLIBCFileRemoveKey(name(), "A"), 0);
    EXPECT_EQ(read_file(file_), "B=1\n");
}

TEST_F(key_value, KLIBCFileRemoveKey_keyWithEqualsSign_isAWholeField) {
    write_file(file_, "dhcp-option=vendor:MSFT,1,x\ndhcp-option=vendor:MSFT,12,y\ndhcp-option=vendor:MSFT2,1\n"
                      "dhcp-option=vendor:MSFT,1\ndhcp-option=vendor:MSFT,1\r\n");
    EXPECT_WORKS(KLIBCFileRemoveKey(name(), "dhcp-option=vendor:MSFT,1"), 0);
    EXPECT_EQ(read_file(file_), "dhcp-option=vendor:MSFT,12,y\ndhcp-option=vendor:MSFT2,1\n");
    EXPECT_WORKS(KLIBCFileRemoveKey(name(), "dhcp-option=vendor:MSFT"), 0);
    EXPECT_EQ(read_file(file_), "dhcp-option=vendor:MSFT2,1\n");
}

TEST_F(key_value, KLIBCFileRemoveKey_badArguments_areRefused) {
    EXPECT_FAILS(KLIBCFileRemoveKey(nullptr, "A"), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileRemoveKey(name(), nullptr), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileRemoveKey(name(), ""), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileRemoveKey(directory().c_str(), "A"), -1, 0x900);
}

TEST_F(key_value, KLIBCFileCheckKeyValue_values_areComparedExactly) {
    write_file(file_, "A=\"yes\"\nB=yes\nC=\nD=YES\nE=yes \n");
    EXPECT_WORKS(KLIBCFileCheckKeyValue(name(), "A", "yes", 0), 1);
    EXPECT_WORKS(KLIBCFileCheckKeyValue(name(), "B", "yes", 0), 1);
    EXPECT_WORKS(KLIBCFileCheckKeyValue(name(), "B", "ye", 0), 0);
    EXPECT_WORKS(KLIBCFileCheckKeyValue(name(), "B", "yess", 0), 0);
    EXPECT_WORKS(KLIBCFileCheckKeyValue(name(), "C", "", 0), 1);
    EXPECT_WORKS(KLIBCFileCheckKeyValue(name(), "D", "yes", 0), 0);
    EXPECT_WORKS(KLIBCFileCheckKeyValue(name(), "E", "yes", 0), 0);
    EXPECT_WORKS(KLIBCFileCheckKeyValue(name(), "F", "", 0), 0);
    EXPECT_FAILS(KLIBCFileCheckKeyValue(path("missing").c_str(), "A", "yes", 0), -1, 0x900);
    EXPECT_FAILS(KLIBCFileCheckKeyValue(name(), "A", nullptr, 0), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileCheckKeyValue(name(), "A", "yes", 2), -1, 0xD00);
}

TEST_F(key_value, KLIBCINFOSetKeyValue_key_goesToTheInformationFile) {
    const kept_file keep{"/etc/kovainfo.conf"};
    write_file("/etc/kovainfo.conf", "a=\"1\"\n");
    EXPECT_WORKS(KLIBCINFOSetKeyValue("eth0_mtu", "9000"), 0);
    EXPECT_EQ(read_file("/etc/kovainfo.conf"), "a=\"1\"\neth0_mtu=\"9000\"\n");
    EXPECT_WORKS(KLIBCINFORemoveKey("a"), 0);
    EXPECT_EQ(read_file("/etc/kovainfo.conf"), "eth0_mtu=\"9000\"\n");
    EXPECT_FAILS(KLIBCINFOSetKeyValue("", "1"), -1, 0xD00);
    EXPECT_FAILS(KLIBCINFORemoveKey(nullptr), -1, 0xD00);
}
