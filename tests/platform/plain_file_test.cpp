#include "platform_test.h"

#include <csignal>
#include <cstring>

#include <fcntl.h>
#include <sched.h>
#include <sys/stat.h>
#include <unistd.h>

using namespace kova_test;

namespace {

class plain_file : public platform_test {
protected:
    ~plain_file() override { KLIBCSzListFree(list_); }

    std::string get_line(const char *prefix, int flags, int size = 100) const {
        char line[100] = "before";
        const int result = KLIBCFileGetLine(path("file").c_str(), prefix, line, size, flags);
        return std::to_string(result > 0 ? 1 : result) + " " + line;
    }

    KLIBSZLIST *list_ = KLIBCSzListAlloc(1);
};

using texts = std::vector<std::string>;

} // namespace

TEST_F(plain_file, KLIBCFileExist_anything_isThere) {
    write_file(path("file"), "");
    ASSERT_EQ(symlink("file", path("link").c_str()), 0);
    ASSERT_EQ(symlink("nothing", path("broken").c_str()), 0);
    EXPECT_WORKS(KLIBCFileExist(path("file").c_str()), 1);
    EXPECT_WORKS(KLIBCFileExist(path("link").c_str()), 1);
    EXPECT_WORKS(KLIBCFileExist(directory().c_str()), 1);
    EXPECT_WORKS(KLIBCFileExist(path("broken").c_str()), 0);
    EXPECT_WORKS(KLIBCFileExist(path("file/below").c_str()), 0);
    EXPECT_FAILS(KLIBCFileExist(nullptr), 0, 0xD00);
    EXPECT_FAILS(KLIBCFileExist(""), 0, 0xD00);
}

TEST_F(plain_file, KLIBCFileCheckDir_directoriesOnly_count) {
    write_file(path("file"), "");
    ASSERT_EQ(symlink(".", path("link").c_str()), 0);
    EXPECT_WORKS(KLIBCFileCheckDir(directory().c_str()), 1);
    EXPECT_WORKS(KLIBCFileCheckDir(path("link").c_str()), 1);
    EXPECT_WORKS(KLIBCFileCheckDir(path("file").c_str()), 0);
    EXPECT_WORKS(KLIBCFileCheckDir(path("missing").c_str()), 0);
    EXPECT_FAILS(KLIBCFileCheckDir(nullptr), 0, 0xD00);
}

TEST_F(plain_file, KLIBCFileTouch_missingFile_isMadeEmpty) {
    umask(077);
    EXPECT_WORKS(KLIBCFileTouch(path("file").c_str()), 0);
    umask(022);
    struct stat status;
    ASSERT_EQ(stat(path("file").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode, S_IFREG | 0644U);
    EXPECT_EQ(status.st_size, 0);
}

TEST_F(plain_file, KLIBCFileTouch_presentFile_staysAsItIs) {
    write_file(path("file"), "text", 0600);
    EXPECT_WORKS(KLIBCFileTouch(path("file").c_str()), 0);
    EXPECT_EQ(read_file(path("file")), "text");
    struct stat status;
    ASSERT_EQ(stat(path("file").c_str(), &status), 0);
    EXPECT_EQ(status.st_mode, S_IFREG | 0600U);
}

TEST_F(plain_file, KLIBCFileTouch_secretMadeMeanwhile_keepsItsMode) {
    const std::string file = path("secret");
    const pid_t toucher = start_child([&] {
        while (KLIBCFileTouch(file.c_str()) == 0)
            ;
        return 1;
    });
    int made = 0;
    int opened_up = 0;
    for (int i = 0; i < 20000; i++) {
        const int fd = open(file.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
        if (fd >= 0) {
            sched_yield();
            struct stat status;
            made++;
            opened_up += fstat(fd, &status) == 0 && status.st_mode == (S_IFREG | 0600U) ? 0 : 1;
            close(fd);
        }
        unlink(file.c_str());
    }
    kill(toucher, SIGKILL);
    EXPECT_EQ(wait_for(toucher), 128 + SIGKILL);
    EXPECT_GT(made, 100);
    EXPECT_EQ(opened_up, 0);
}

TEST_F(plain_file, KLIBCFileTouch_noPlaceForAFile_fails) {
    EXPECT_FAILS(KLIBCFileTouch(path("missing/file").c_str()), -1, 0x900);
    EXPECT_FAILS(KLIBCFileTouch(directory().c_str()), -1, 0x900);
    EXPECT_FAILS(KLIBCFileTouch(""), -1, 0xD00);
}

TEST_F(plain_file, KLIBCFileEnumDir_anyType_givesSortedNames) {
    write_file(path("b"), "");
    write_file(path("a10"), "");
    write_file(path("a2"), "");
    write_file(path(".hidden"), "");
    ASSERT_EQ(mkdir(path("dir").c_str(), 0755), 0);
    ASSERT_EQ(symlink("b", path("link").c_str()), 0);
    ASSERT_EQ(KLIBCSzListPush(&list_, "zz"), 0);
    EXPECT_WORKS(KLIBCFileEnumDir(directory().c_str(), list_, nullptr, 64), 5);
    EXPECT_EQ(texts_of(list_), (texts{"zz", "a10", "a2", "b", "dir", "link"}));
    KLIBCSzListRemoveAll(list_);
    EXPECT_WORKS(KLIBCFileEnumDir(directory().c_str(), list_, "a", 64), 2);
    EXPECT_EQ(texts_of(list_), (texts{"a10", "a2"}));
}

TEST_F(plain_file, KLIBCFileEnumDir_regularFiles_leaveTheRestOut) {
    write_file(path("ifcfg-eth1"), "");
    write_file(path("ifcfg-eth0"), "");
    write_file(path("other"), "");
    ASSERT_EQ(mkdir(path("ifcfg-dir").c_str(), 0755), 0);
    ASSERT_EQ(mkfifo(path("ifcfg-fifo").c_str(), 0644), 0);
    ASSERT_EQ(symlink("ifcfg-eth0", path("ifcfg-link").c_str()), 0);
    EXPECT_WORKS(KLIBCFileEnumDir(directory().c_str(), list_, "ifcfg-", 1154), 2);
    EXPECT_EQ(texts_of(list_), (texts{"ifcfg-eth0", "ifcfg-eth1"}));
}

TEST_F(plain_file, KLIBCFileEnumDir_manyNames_areAllThere) {
    for (int i = 0; i < 3000; i++)
        write_file(path("f" + std::to_string(i)), "");
    EXPECT_WORKS(KLIBCFileEnumDir(directory().c_str(), list_, nullptr, 1154), 3000);
    EXPECT_EQ(list_->nItem, 3000U);
}

TEST_F(plain_file, KLIBCFileEnumDir_noDirectoryOrBadArgument_fails) {
    write_file(path("file"), "");
    EXPECT_FAILS(KLIBCFileEnumDir(path("missing").c_str(), list_, nullptr, 64), -1, 0x900);
    EXPECT_FAILS(KLIBCFileEnumDir(path("file").c_str(), list_, nullptr, 64), -1, 0x900);
    EXPECT_FAILS(KLIBCFileEnumDir(nullptr, list_, nullptr, 64), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileEnumDir(directory().c_str(), nullptr, nullptr, 64), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileEnumDir(directory().c_str(), list_, nullptr, 1), -1, 0xD00);
    EXPECT_EQ(list_->nItem, 0U);
}

TEST_F(plain_file, KLIBCFileGetLine_prefix_givesTheFirstWholeLine) {
    write_file(path("file"), "x\nabc=1\r\nabc=2\nlast");
    EXPECT_EQ(get_line("abc", 2), "1 abc=1");
    EXPECT_EQ(get_line("abc=2", 2), "1 abc=2");
    EXPECT_EQ(get_line("last", 2), "1 last");
    EXPECT_EQ(get_line("bc", 2), "0 ");
    EXPECT_EQ(get_line("abc", 2, 4), "1 abc");
    EXPECT_EQ(KLIBCErrGet(), kMark);
}

TEST_F(plain_file, KLIBCFileGetLine_wholeField_endsAtCommaOrLine) {
    write_file(path("file"), "v:MSFT,12,a\nv:MSFT2,1\nv:MSFT,1,b\nv:X\r\n");
    EXPECT_EQ(get_line("v:MSFT,1", 1026), "1 v:MSFT,1,b");
    EXPECT_EQ(get_line("v:MSFT,1", 2), "1 v:MSFT,12,a");
    EXPECT_EQ(get_line("v:MSFT2,1", 1026), "1 v:MSFT2,1");
    EXPECT_EQ(get_line("v:X", 1026), "1 v:X");
    EXPECT_EQ(get_line("v:MSF", 1026), "0 ");
}

TEST_F(plain_file, KLIBCFileGetLine_missingFileOrBadArgument_fails) {
    char line[8] = "x";
    EXPECT_FAILS(KLIBCFileGetLine(path("file").c_str(), "a", line, 8, 2), -1, 0x900);
    EXPECT_STREQ(line, "");
    EXPECT_FAILS(KLIBCFileGetLine(path("file").c_str(), "", line, 8, 2), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileGetLine(path("file").c_str(), "a", nullptr, 8, 2), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileGetLine(path("file").c_str(), "a", line, 0, 2), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileGetLine(path("file").c_str(), "a", line, 8, 0), -1, 0xD00);
}

TEST_F(plain_file, KLIBCFileReadLines_everyLine_isAppended) {
    write_file(path("file"), "one\n\ntwo\r\n three ");
    EXPECT_WORKS(KLIBCFileReadLines(path("file").c_str(), list_), 4);
    EXPECT_EQ(texts_of(list_), (texts{"one", "", "two", " three "}));
    write_file(path("file"), "");
    EXPECT_WORKS(KLIBCFileReadLines(path("file").c_str(), list_), 0);
    write_file(path("file"), std::string(200000, 'x') + "\nend\n");
    KLIBCSzListRemoveAll(list_);
    EXPECT_WORKS(KLIBCFileReadLines(path("file").c_str(), list_), 2);
    EXPECT_EQ(texts_of(list_), (texts{std::string(65536, 'x'), "end"}));
}

TEST_F(plain_file, KLIBCFileReadLines_kernelFile_isRead) {
    EXPECT_GT(KLIBCFileReadLines("/proc/self/status", list_), 10);
    EXPECT_NE(KLIBCSzListFind(list_, "Name:\tkova-platform-t"), -1);
}

TEST_F(plain_file, KLIBCFileReadLines_missingFileOrBadArgument_fails) {
    EXPECT_FAILS(KLIBCFileReadLines(path("file").c_str(), list_), -1, 0x900);
    EXPECT_FAILS(KLIBCFileReadLines(directory().c_str(), list_), -1, 0x900);
    EXPECT_FAILS(KLIBCFileReadLines(nullptr, list_), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileReadLines(path("file").c_str(), nullptr), -1, 0xD00);
}

TEST_F(plain_file, KLIBCFileAddLine_noMarker_goesToTheEnd) {
    EXPECT_WORKS(KLIBCFileAddLine(path("file").c_str(), nullptr, "one", 0), 0);
    EXPECT_WORKS(KLIBCFileAddLine(path("file").c_str(), nullptr, "two\n", 512), 0);
    EXPECT_EQ(read_file(path("file")), "one\ntwo\n");
    write_file(path("file"), "open");
    EXPECT_WORKS(KLIBCFileAddLine(path("file").c_str(), nullptr, "end", 0), 0);
    EXPECT_EQ(read_file(path("file")), "open\nend\n");
}

TEST_F(plain_file, KLIBCFileAddLine_marker_isFollowedByTheLine) {
    write_file(path("file"), "[ab]\n[a]\n[a]\nx\n");
    EXPECT_WORKS(KLIBCFileAddLine(path("file").c_str(), "[a]", "new", 0), 0);
    EXPECT_EQ(read_file(path("file")), "[ab]\n[a]\nnew\n[a]\nx\n");
    EXPECT_WORKS(KLIBCFileAddLine(path("file").c_str(), "[none]", "end", 0), 0);
    EXPECT_EQ(read_file(path("file")), "[ab]\n[a]\nnew\n[a]\nx\nend\n");
}

TEST_F(plain_file, KLIBCFileAddLine_badArguments_changeNothing) {
    write_file(path("file"), "x\n");
    EXPECT_FAILS(KLIBCFileAddLine(path("file").c_str(), nullptr, "a\nb", 0), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileAddLine(path("file").c_str(), nullptr, "", 0), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileAddLine(path("file").c_str(), nullptr, nullptr, 0), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileAddLine(path("file").c_str(), "", "a", 0), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileAddLine(path("file").c_str(), nullptr, "a", 1), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileAddLine(nullptr, nullptr, "a", 0), -1, 0xD00);
    EXPECT_EQ(read_file(path("file")), "x\n");
}

TEST_F(plain_file, KLIBCFileReplaceSubStr_everyOccurrence_isReplaced) {
    write_file(path("file"), "eth0 eth0\neth01 eeth0");
    EXPECT_WORKS(KLIBCFileReplaceSubStr(path("file").c_str(), "eth0", "bond0"), 0);
    EXPECT_EQ(read_file(path("file")), "bond0 bond0\nbond01 ebond0");
    EXPECT_WORKS(KLIBCFileReplaceSubStr(path("file").c_str(), "bond0", ""), 0);
    EXPECT_EQ(read_file(path("file")), " \n1 e");
    EXPECT_WORKS(KLIBCFileReplaceSubStr(path("file").c_str(), "none", "x"), 0);
    write_file(path("file"), "aaaa");
    EXPECT_WORKS(KLIBCFileReplaceSubStr(path("file").c_str(), "aa", "a"), 0);
    EXPECT_EQ(read_file(path("file")), "aa");
    write_file(path("file"), std::string{"\0x\0x", 4});
    EXPECT_WORKS(KLIBCFileReplaceSubStr(path("file").c_str(), "x", "yy"), 0);
    EXPECT_EQ(read_file(path("file")), (std::string{"\0yy\0yy", 6}));
}

TEST_F(plain_file, KLIBCFileReplaceSubStr_missingFileOrBadArgument_fails) {
    EXPECT_FAILS(KLIBCFileReplaceSubStr(path("file").c_str(), "a", "b"), -1, 0x900);
    EXPECT_FAILS(KLIBCFileReplaceSubStr(path("file").c_str(), "", "b"), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileReplaceSubStr(path("file").c_str(), "a", nullptr), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileReplaceSubStr("", "a", "b"), -1, 0xD00);
    EXPECT_TRUE(names_in(directory()).empty());
}

TEST_F(plain_file, KLIBCFileTempFileOpen_template_becomesAPrivateFile) {
    std::string name = path("VLAN_XXXXXX");
    FILE *stream = KLIBCFileTempFileOpen(name.data());
    ASSERT_NE(stream, nullptr);
    EXPECT_NE(name, path("VLAN_XXXXXX"));
    EXPECT_TRUE(fcntl(fileno(stream), F_GETFD) & FD_CLOEXEC);
    EXPECT_GT(fprintf(stream, "text"), 0);
    EXPECT_EQ(fclose(stream), 0);
    EXPECT_EQ(read_file(name), "text");
    struct stat status;
    ASSERT_EQ(stat(name.c_str(), &status), 0);
    EXPECT_EQ(status.st_mode, S_IFREG | 0600U);
}

TEST_F(plain_file, KLIBCFileTempFileOpen_badTemplate_fails) {
    std::string name = path("VLAN");
    EXPECT_FAILS(KLIBCFileTempFileOpen(name.data()), nullptr, 0xD00);
    EXPECT_FAILS(KLIBCFileTempFileOpen(nullptr), nullptr, 0xD00);
    name = path("missing/XXXXXX");
    EXPECT_FAILS(KLIBCFileTempFileOpen(name.data()), nullptr, 0x900);
}

TEST_F(plain_file, KLIBCFileITmpName_target_getsUniqueHiddenNamesBesideIt) {
    char first[200];
    char second[200];
    EXPECT_WORKS(KLIBCFileITmpName(path("ifcfg-eth0").c_str(), first, sizeof first), 0);
    EXPECT_WORKS(KLIBCFileITmpName(path("ifcfg-eth0").c_str(), second, sizeof second), 0);
    EXPECT_STRNE(first, second);
    EXPECT_EQ(std::string{first}.rfind(path(".ifcfg-eth0."), 0), 0U);
    EXPECT_TRUE(names_in(directory()).empty());
}

TEST_F(plain_file, KLIBCFileITmpName_shortBufferOrBadArgument_fails) {
    char name[24] = "x";
    EXPECT_FAILS(KLIBCFileITmpName("/etc/hosts", name, sizeof name), -1, 0xD00);
    EXPECT_STREQ(name, "");
    EXPECT_FAILS(KLIBCFileITmpName("/etc/", name, sizeof name), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileITmpName("", name, sizeof name), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileITmpName("/etc/hosts", nullptr, 100), -1, 0xD00);
    EXPECT_FAILS(KLIBCFileITmpName("/etc/hosts", name, 0), -1, 0xD00);
}
