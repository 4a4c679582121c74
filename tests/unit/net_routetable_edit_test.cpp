#include "support/rig.h"

#include <climits>
#include <kovanetsdk/routing.h>

using namespace kova_test;

namespace {

constexpr int kAdd = NET_ROUTE_ADD;
constexpr int kDelete = NET_ROUTE_DELETE;

const std::string kIpDelete = "/sbin/ip route del 192.168.1.0/24 dev eth0 src 192.168.1.10";
const std::string kIpAdd = "/sbin/ip route add 192.168.1.0/24 dev eth0 src 192.168.1.10";
const std::string kRouteDelete = "/sbin/route del -net 192.168.1.0 netmask 255.255.255.0 dev eth0";
const std::string kRouteAdd = "/sbin/route add -net 192.168.1.0 netmask 255.255.255.0 dev eth0";

const std::string kNotDeleted = "INFO net_routetable_edit:N eth0 ip route del failed, instead of route";
const std::string kNotDeletedEither =
    "INFO net_routetable_edit:N cmd route del -net 192.168.1.0 netmask 255.255.255.0 dev eth0 failded";
const std::string kNotAdded =
    "INFO net_routetable_edit:N eth0 ip route add failed, might be the same subnet, instead of route";
const std::string kNotAddedEither =
    "INFO net_routetable_edit:N cmd route add -net 192.168.1.0 netmask 255.255.255.0 dev eth0 failded";

outcome told(const std::string &text) {
    return {.result = -1, .log = {"ERR net_routetable_edit:N " + text}};
}

} // namespace

class net_routetable_edit : public unit_test {
protected:
    outcome edit(int type, const char *szIP = "192.168.1.10", const char *szNetmask = "255.255.255.0",
                 const char *szIfname = "eth0") {
        return rig.observe([=] { return NetRoutetableEdit(type, szIP, szNetmask, szIfname); });
    }
};

TEST_F(net_routetable_edit, NetRoutetableEdit_missingArgument_isTold) {
    for (const int type : {kAdd, kDelete, 2}) {
        for (const char *missing : {static_cast<const char *>(nullptr), ""}) {
            EXPECT_OUTCOME(edit(type, missing), told("bad parameter"));
            EXPECT_OUTCOME(edit(type, "192.168.1.10", missing), told("bad parameter"));
            EXPECT_OUTCOME(edit(type, "192.168.1.10", "255.255.255.0", missing), told("bad parameter"));
        }
    }
}

TEST_F(net_routetable_edit, NetRoutetableEdit_nameThatIsNone_isTold) {
    for (const std::string &name : bad_names()) {
        EXPECT_OUTCOME(edit(kAdd, "192.168.1.10", "255.255.255.0", name.c_str()), told("bad parameter"));
    }
}

TEST_F(net_routetable_edit, NetRoutetableEdit_longName_isLeftToTheTool) {
    for (const size_t length : {15U, 63U, 64U, 235U}) {
        const std::string name = long_text(length, 'e');
        EXPECT_OUTCOME(edit(kDelete, "192.168.1.10", "255.255.255.0", name.c_str()),
                       {.commands = {"/sbin/ip route del 192.168.1.0/24 dev " + name + " src 192.168.1.10"}});
    }
}

TEST_F(net_routetable_edit, NetRoutetableEdit_anyOtherType_isTold) {
    for (const int type : {2, 3, -1, INT_MAX, INT_MIN}) {
        EXPECT_OUTCOME(edit(type), told("error type"));
        EXPECT_OUTCOME(edit(type, "nonsense", "nonsense"), told("error type"));
    }
}

TEST_F(net_routetable_edit, NetRoutetableEdit_textThatIsNoAddress_isTold) {
    for (const std::string &text : texts{"24", "255.255.255", "255.255.255.256", "255.255.255.0 ", "255.255.255.0/24",
                                         "0xffffff00", "ffff::", "none\n", "%s%n", long_text(4096)}) {
        for (const int type : {kAdd, kDelete}) {
            EXPECT_OUTCOME(edit(type, "192.168.1.10", text.c_str()), told("inet_pton error (" + text + ")"));
            EXPECT_OUTCOME(edit(type, text.c_str()), told("inet_pton error (" + text + ")"));
        }
    }
    EXPECT_OUTCOME(edit(kAdd, "no address", "no mask"), told("inet_pton error (no mask)"));
}

TEST_F(net_routetable_edit, NetRoutetableEdit_delete_runsTheTool) {
    EXPECT_OUTCOME(edit(kDelete), {.commands = {kIpDelete}});
}

TEST_F(net_routetable_edit, NetRoutetableEdit_add_deletesAnOldRouteFirst) {
    EXPECT_OUTCOME(edit(kAdd), {.commands = {kIpDelete, kIpAdd}});
}

TEST_F(net_routetable_edit, NetRoutetableEdit_deleteThatTheToolRefuses_goesToTheOther) {
    for (const int status : {1, 2, 127, 137, -1}) {
        rig.answer("/sbin/ip", status);
        EXPECT_OUTCOME(edit(kDelete), {.log = {kNotDeleted}, .commands = {kIpDelete, kRouteDelete}});
    }
}

TEST_F(net_routetable_edit, NetRoutetableEdit_deleteThatBothRefuse_isOnlyNoted) {
    rig.answer("/sbin/ip", 2);
    rig.answer("/sbin/route", 7);
    EXPECT_OUTCOME(edit(kDelete), {.log = {kNotDeleted, kNotDeletedEither}, .commands = {kIpDelete, kRouteDelete}});
}

TEST_F(net_routetable_edit, NetRoutetableEdit_addWithoutAnOldRoute_goesOn) {
    rig.answer("/sbin/ip route del", 2);
    EXPECT_OUTCOME(edit(kAdd), {.log = {kNotDeleted}, .commands = {kIpDelete, kRouteDelete, kIpAdd}});
    rig.answer("/sbin/route del", 7);
    EXPECT_OUTCOME(edit(kAdd),
                   {.log = {kNotDeleted, kNotDeletedEither}, .commands = {kIpDelete, kRouteDelete, kIpAdd}});
}

TEST_F(net_routetable_edit, NetRoutetableEdit_addThatTheToolRefuses_goesToTheOther) {
    rig.answer("/sbin/ip route add", 2);
    EXPECT_OUTCOME(edit(kAdd), {.log = {kNotAdded}, .commands = {kIpDelete, kIpAdd, kRouteAdd}});
}

TEST_F(net_routetable_edit, NetRoutetableEdit_addThatBothRefuse_isOnlyNoted) {
    for (const int status : {1, 127, -1}) {
        rig.answer("/sbin/ip", status);
        rig.answer("/sbin/route", status);
        EXPECT_OUTCOME(edit(kAdd), {.log = {kNotDeleted, kNotDeletedEither, kNotAdded, kNotAddedEither},
                                    .commands = {kIpDelete, kRouteDelete, kIpAdd, kRouteAdd}});
    }
}

TEST_F(net_routetable_edit, NetRoutetableEdit_everyMask_countsItsBits) {
    struct mask_case {
        const char *netmask;
        std::string target;
    };
    const mask_case cases[] = {{"255.255.255.0", "10.11.12.0/24"},
                               {"255.0.255.0", "10.0.12.0/16"},
                               {"255.255.255.255", "10.11.12.13/32"},
                               {"0.0.0.0", "0.0.0.0/0"},
                               {"255.255.255.252", "10.11.12.12/30"},
                               {"128.0.0.0", "0.0.0.0/1"},
                               {"0.0.0.1", "0.0.0.1/1"},
                               {"85.85.85.85", "0.1.4.5/16"}};
    for (const mask_case &each : cases) {
        EXPECT_OUTCOME(edit(kDelete, "10.11.12.13", each.netmask),
                       {.commands = {"/sbin/ip route del " + each.target + " dev eth0 src 10.11.12.13"}});
    }
    rig.answer("/sbin/ip", 2);
    const outcome got = edit(kDelete, "10.11.12.13", "255.0.255.0");
    EXPECT_EQ("/sbin/route del -net 10.0.12.0 netmask 255.0.255.0 dev eth0", got.commands.at(1));
}
