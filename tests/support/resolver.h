/**
 * @file
 * What the tests of the resolver share: an appliance without any of its files, and lists of texts.
 */
#pragma once

#include "support/rig.h"

#include <filesystem>
#include <kova/core.h>
#include <kovanetsdk/dns.h>

namespace kova_test {

inline const std::string kResolvConf = "/etc/resolv.conf";
inline const std::string kStaticConf = "/etc/resolv.conf.static";
inline const std::string kOptionConf = "/etc/resolv.conf.option";
inline const std::string kAutoIpv4 = "/etc/iproute2/config/resolv4.conf";
inline const std::string kAutoIpv6 = "/etc/iproute2/config/resolv6.conf";
inline const std::string kKovaInfoConf = "/etc/kovainfo.conf";

/** A list of the platform with these texts. */
class text_list {
public:
    explicit text_list(const texts &items = {}) {
        for (const std::string &item : items) {
            EXPECT_EQ(0, KLIBCSzListPush(&list_, item.c_str()));
        }
    }
    text_list(const text_list &) = delete;
    text_list &operator=(const text_list &) = delete;
    ~text_list() { KLIBCSzListFree(list_); }

    [[nodiscard]] KLIBSZLIST *get() const { return list_; }
    [[nodiscard]] KLIBSZLIST **out() { return &list_; }
    [[nodiscard]] texts items() const { return {list_->ppszItem, list_->ppszItem + list_->nItem}; }
    /** Takes an entry out, so that there is nothing in its place. */
    void make_null(size_t index) {
        free(list_->ppszItem[index]);
        list_->ppszItem[index] = nullptr;
    }

private:
    KLIBSZLIST *list_ = KLIBCSzListAlloc(4);
};

class resolver_test : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        for (const std::string &path : {kResolvConf, kStaticConf, kOptionConf}) {
            std::filesystem::remove_all(path);
        }
    }
    /** Nothing but these resolver files stands in /etc: no temporary one is left. */
    static void expect_files(const texts &names) {
        texts found = list_dir("/etc");
        std::erase_if(found, [](const std::string &name) { return name.rfind("resolv.conf", 0) != 0; });
        EXPECT_EQ(names, found);
    }
    /** What a change of the servers in use announces. */
    static texts change_of(const std::string &servers) {
        return {"net/dns_change 4 " + servers, "net/dns_change 5 " + servers};
    }
};

/** A small or read-only file system over /etc while this lives; the files of before are behind it. */
class etc_mount {
public:
    explicit etc_mount(const std::string &options) { shell("mount -t tmpfs -o " + options + " none /etc"); }
    etc_mount(const etc_mount &) = delete;
    etc_mount &operator=(const etc_mount &) = delete;
    ~etc_mount() { shell("umount /etc"); }
};

} // namespace kova_test
