/**
 * @file
 * Random subnets of the DHCP server. What is written is read back as it was, and the daemon takes every option that the
 * library takes, apart from the kinds of values listed here.
 *
 * KOVA_SEED says what is generated, KOVA_ROUNDS how much.
 */
#include "support/rig.h"

#include <algorithm>
#include <cstring>
#include <filesystem>
#include <kovanetsdk/dhcp.h>
#include <map>
#include <random>
#include <regex>

using namespace kova_test;

namespace {

unsigned long setting(const char *name, unsigned long otherwise) {
    const char *const text = getenv(name);
    return text != nullptr ? strtoul(text, nullptr, 10) : otherwise;
}

std::string joined(const texts &items) {
    std::string text;
    for (const std::string &item : items) {
        text += (text.empty() && &item == items.data() ? "" : ",") + item;
    }
    return text;
}

/** Random numbers, texts and addresses. */
class generator {
public:
    explicit generator(unsigned long seed) : engine_(seed) {}

    uint64_t number(uint64_t low, uint64_t high) { return std::uniform_int_distribution<uint64_t>{low, high}(engine_); }
    bool one_in(uint64_t n) { return number(1, n) == 1; }
    const std::string &one_of(const texts &choices) { return choices[number(0, choices.size() - 1)]; }
    std::string text_of(const std::string &alphabet, size_t shortest, size_t longest) {
        std::string text(number(shortest, longest), ' ');
        for (char &byte : text) {
            byte = alphabet[number(0, alphabet.size() - 1)];
        }
        return text;
    }
    /** Everything that may stand between two ",". */
    std::string any_text(size_t shortest, size_t longest) {
        std::string alphabet;
        for (int byte = ' '; byte < 256; ++byte) {
            if (byte != ',' && byte != 0x7f) {
                alphabet += static_cast<char>(byte);
            }
        }
        return text_of(alphabet, shortest, longest);
    }
    std::string address() {
        return std::to_string(number(1, 126)) + "." + std::to_string(number(0, 255)) + "." +
               std::to_string(number(0, 255)) + "." + std::to_string(number(1, 254));
    }
    /** The same, seldom with a part in octal or, for options below 120, in hexadecimal: with an "x" the others are
       names and texts to the daemon. */
    std::string any_address(int option) {
        const texts prefixes = option < 120 ? texts{"0", "00", "0x"} : texts{"0", "00"};
        return one_in(60) ? one_of(prefixes) + std::to_string(number(1, 7)) + ".1.2.3" : address();
    }
    std::string mask() {
        const uint32_t bits = 0xffffffffU << number(1, 31);
        return std::to_string(bits >> 24) + "." + std::to_string(bits >> 16 & 255) + "." +
               std::to_string(bits >> 8 & 255) + "." + std::to_string(bits & 255);
    }
    std::string name() {
        return one_in(3) ? one_of({"eth0", "bond0", "ovs_eth0", "eth0.10"})
                         : text_of("abcxyz0189.-_%+:@", 3, one_in(9) ? 200 : 15);
    }

private:
    std::mt19937_64 engine_;
};

/** An option as texts: a list when `is_list`. */
struct option {
    int number = 0;
    std::string name{};
    bool is_list = false;
    std::string value{};
    texts items{};

    [[nodiscard]] std::string line_value() const { return is_list ? joined(items) : value; }
    [[nodiscard]] std::string str() const {
        return std::to_string(number) + " " + name + " [" + line_value() + "]" + (is_list ? " list" : "");
    }
};

struct kind {
    int number;
    const char *name;
    enum { flag, number_of, node_type, text, address, addresses, filters, routes } takes;
    uint64_t low = 0, high = 0;
};

const kind kKinds[] = {{7, "log-server", kind::addresses},
                       {9, "lpr-server", kind::addresses},
                       {13, "boot-file-size", kind::number_of, 0, 65536},
                       {16, "swap-server", kind::address},
                       {17, "root-path", kind::text},
                       {18, "extension-path", kind::text},
                       {19, "ip-forward-enable", kind::flag},
                       {20, "non-local-source-routing", kind::flag},
                       {21, "policy-filter", kind::filters},
                       {22, "max-datagram-reassembly", kind::number_of, 576, 65536},
                       {23, "default-ttl", kind::number_of, 1, 255},
                       {26, "mtu", kind::number_of, 68, 65536},
                       {27, "all-subnets-local", kind::flag},
                       {31, "router-discovery", kind::flag},
                       {32, "router-solicitation", kind::address},
                       {34, "trailer-encapsulation", kind::flag},
                       {35, "arp-timeout", kind::number_of, 0, UINT64_MAX},
                       {36, "ethernet-encap", kind::flag},
                       {37, "tcp-ttl", kind::number_of, 1, 255},
                       {38, "tcp-keepalive", kind::number_of, 0, UINT64_MAX},
                       {40, "nis-domain", kind::text},
                       {41, "nis-server", kind::addresses},
                       {42, "ntp-server", kind::addresses},
                       {44, "netbios-ns", kind::addresses},
                       {45, "netbios-dd", kind::addresses},
                       {46, "netbios-nodetype", kind::node_type},
                       {47, "netbios-scope", kind::text},
                       {48, "x-windows-fs", kind::addresses},
                       {49, "x-windows-dm", kind::addresses},
                       {58, "T1", kind::number_of, 0, UINT64_MAX},
                       {59, "T2", kind::number_of, 0, UINT64_MAX},
                       {64, "nis+-domain", kind::text},
                       {65, "nis+-server", kind::addresses},
                       {68, "mobile-ip-home", kind::addresses},
                       {69, "smtp-server", kind::addresses},
                       {70, "pop3-server", kind::addresses},
                       {71, "nntp-server", kind::addresses},
                       {74, "irc-server", kind::addresses},
                       {120, "sip-server", kind::addresses},
                       {121, "classless-static-route", kind::routes}};

/** A text for an option: words, paths, what looks like something else to the daemon, any bytes, long ones. */
std::string random_text(generator &any) {
    switch (any.number(0, 7)) {
    case 0:
        return any.text_of("abcdefghijklmnopqrstuvwxyz.-", 1, 30);
    case 1:
        return "/" + any.text_of("abc/._-0123456789", 1, 60);
    case 2:
        return any.text_of("0123456789abcdefABCDEF:", 1, 30);
    case 3:
        return any.text_of("0123456789./ -", 1, 20);
    case 4:
        return any.text_of("ab \"\\#", 1, 12);
    case 5:
        return any.text_of("ab[]:.=@*!'", 1, 12);
    case 6:
        return any.any_text(1, 40);
    default:
        return any.text_of("xyz", 200, 1023);
    }
}

std::string random_number(generator &any, const kind &of) {
    const uint64_t number = any.one_in(4)   ? of.low
                            : any.one_in(3) ? of.high
                            : any.one_in(2) ? any.number(of.low, std::min<uint64_t>(of.high, UINT32_MAX))
                                            : any.number(of.low, of.high);
    return (any.one_in(9) ? "000" : "") + std::to_string(number);
}

size_t random_count(generator &any) {
    return any.one_in(9) ? any.number(0, 70) : any.number(1, 8);
}

option random_option(generator &any) {
    const kind &of = kKinds[any.number(0, std::size(kKinds) - 1)];
    option made{.number = of.number, .name = of.name, .is_list = of.takes >= kind::addresses};
    switch (of.takes) {
    case kind::flag:
        made.value = any.one_of({"0", "1"});
        break;
    case kind::number_of:
        made.value = random_number(any, of);
        break;
    case kind::node_type:
        made.value = any.one_of({"1", "2", "4", "8"});
        break;
    case kind::text:
        made.value = random_text(any);
        break;
    case kind::address:
        made.value = any.any_address(of.number);
        break;
    case kind::addresses:
        for (size_t left = random_count(any); left > 0; --left) {
            made.items.push_back(any.any_address(of.number));
        }
        break;
    case kind::filters:
        for (size_t left = random_count(any); left > 0; --left) {
            made.items.push_back(made.items.size() % 2 == 0 ? any.any_address(of.number) : any.mask());
        }
        break;
    case kind::routes:
        for (size_t left = random_count(any); left > 0; --left) {
            made.items.push_back(any.any_address(of.number) +
                                 (made.items.size() % 2 == 0 ? "/" + std::to_string(any.number(0, 32)) : ""));
        }
        break;
    }
    return made;
}

// ---- kinds of values that the library takes and the daemon refuses

/** Whether the daemon misses a closing quote: what follows "#" after a blank is no longer looked at. */
bool has_open_quote(const option &tried) {
    const std::string &text = tried.value;
    bool after_blank = false;
    for (size_t i = 0; i < text.size(); ++i) {
        if (text[i] == '"') {
            for (++i; i < text.size() && text[i] != '"'; ++i) {
                if (text[i] == '\\' && i + 1 < text.size() && strchr("\"tnebr\\", text[i + 1]) != nullptr) {
                    ++i;
                }
            }
            if (i >= text.size()) {
                return true;
            }
            ++i; // and the byte after the quote is never one itself
            if (i >= text.size()) {
                return false;
            }
        }
        if (text[i] == '#' && after_blank) {
            return false;
        }
        after_blank = text[i] == ' ';
    }
    return false;
}

/** Whether a part of an address is in octal or hexadecimal. */
bool has_other_digits(const option &tried) {
    const std::string value = tried.line_value();
    const auto *const of = std::find_if(std::begin(kKinds), std::end(kKinds),
                                        [&](const kind &each) { return each.number == tried.number; });
    const bool takes_addresses = of != std::end(kKinds) && of->takes >= kind::address;
    return takes_addresses && std::regex_search(value, std::regex{"(^|[.,])0[0-9x]"});
}

struct finding {
    const char *what;
    const char *reason;
    option sample;
    bool (*holds)(const option &tried);
};

/** Bytes that the items of a list take in an option. */
size_t size_of_list(const option &tried) {
    size_t size = tried.number == 120 ? 1 : 0;
    for (const std::string &item : tried.items) {
        const size_t slash = item.find('/');
        size += slash == std::string::npos ? 4 : 1 + (strtoul(item.c_str() + slash + 1, nullptr, 10) + 7) / 8;
    }
    return size;
}

std::string trimmed(const std::string &text) {
    const size_t first = text.find_first_not_of(' ');
    return first == std::string::npos ? "" : text.substr(first, text.find_last_not_of(' ') + 1 - first);
}

/** Whether a text holds nothing but what addresses and networks are made of, and is neither one nor a number. */
bool looks_like_address(const std::string &text) {
    return !std::regex_match(text, std::regex{"[0-9]+([.][0-9]+){3}(/[0-9]+)?"}) &&
           text.find_first_not_of("0123456789./ ") == std::string::npos &&
           text.find_first_of("./ ") != std::string::npos && text.find_first_of("0123456789") != std::string::npos &&
           text[0] != '/';
}

const finding kRefusedByTheDaemon[] = {
    {"text with a double quote that is not closed",
     "the daemon reads quotes in its lines",
     {.number = 17, .name = "root-path", .value = "/srv/12\" disk"},
     [](const option &tried) { return !tried.is_list && has_open_quote(tried); }},
    {"text of more than 255 bytes",
     "an option's length is one byte",
     {.number = 40, .name = "nis-domain", .value = std::string(256, 'x')},
     [](const option &tried) {
         return !tried.is_list && tried.value.size() > 255 && tried.value.find_first_not_of("xyz") == std::string::npos;
     }},
    {"list of more than 255 bytes",
     "an option's length is one byte",
     {.number = 42, .name = "ntp-server", .is_list = true, .items = texts(64, "10.0.0.1")},
     [](const option &tried) { return tried.is_list && size_of_list(tried) > 255; }},
    {"address with a part in octal or hexadecimal",
     "the library reads these as well, the daemon does not",
     {.number = 16, .name = "swap-server", .value = "010.0.0.1"},
     has_other_digits},
    {"list without items",
     "the daemon wants an address",
     {.number = 42, .name = "ntp-server", .is_list = true},
     [](const option &tried) {
         return tried.is_list && tried.items.empty() && tried.number != 120 && tried.number != 121;
     }},
    {"scope of digits, dots and slashes that is no address",
     "the daemon tries it as an address",
     {.number = 47, .name = "netbios-scope", .value = "1.2.3"},
     [](const option &tried) { return tried.number == 47 && looks_like_address(trimmed(tried.value)); }},
};

/** The finding that a value belongs to; NULL when the daemon should take it. */
const finding *known(const option &tried) {
    const auto *const found = std::find_if(std::begin(kRefusedByTheDaemon), std::end(kRefusedByTheDaemon),
                                           [&](const finding &each) { return each.holds(tried); });
    return found == std::end(kRefusedByTheDaemon) ? nullptr : found;
}

/** Lists that the reader takes for lines with an empty item. */
bool is_lost_when_read(const option &tried) {
    return tried.is_list && tried.items.empty();
}

/** What the daemon says about all fragments, or one: "" when it takes them. */
std::string refusal_of_daemon(const std::string &arguments) {
    FILE *const output = popen(("/usr/sbin/dnsmasq --test -C /dev/null " + arguments + " 2>&1").c_str(), "r");
    std::string said;
    for (int byte = getc(output); byte != EOF; byte = getc(output)) {
        said += static_cast<char>(byte);
    }
    const int status = pclose(output);
    return status == 0 ? "" : said.empty() ? "status " + std::to_string(status) : said;
}

template<size_t Size> void set_field(char (&field)[Size], const std::string &text) {
    ASSERT_LT(text.size(), Size);
    memset(field, '\0', Size);
    memcpy(field, text.data(), text.size());
}

} // namespace

class dhcp_subnets : public unit_test {
protected:
    void SetUp() override {
        unit_test::SetUp();
        shell("mkdir /etc/dhcpd");
        rig.answer("/bin/mkdir", 0); // thousands of times
        printf("KOVA_SEED=%lu KOVA_ROUNDS=%lu\n", seed, rounds);
        RecordProperty("seed", std::to_string(seed));
    }
    /** A record that the daemon takes. */
    static void fill(generator &any, DHCP_TAG_CONF &conf) {
        conf.enabled = 1;
        conf.lease_time = static_cast<int>(any.number(120, 1000000));
        const std::string net = "10." + std::to_string(any.number(0, 255)) + "." + std::to_string(any.number(0, 255));
        set_field(conf.start_ip, net + ".10");
        set_field(conf.end_ip, net + ".20");
        set_field(conf.netmask, "255.255.255.0");
        set_field(conf.router, net + ".1");
        set_field(conf.domain, any.one_in(2) ? "" : any.text_of("abcdef", 1, 20) + ".example");
        set_field(conf.dns1, any.address());
        set_field(conf.dns2, any.one_in(2) ? "" : any.address());
    }
    /** Hangs options on a record; what they own lives as long as the test. */
    void hang(const std::vector<option> &wanted, DHCP_TAG_CONF &conf) {
        release();
        records_.resize(wanted.size());
        for (size_t i = 0; i < wanted.size(); ++i) {
            records_[i] = {};
            records_[i].number = wanted[i].number;
            set_field(records_[i].name, wanted[i].name);
            set_field(records_[i].value, wanted[i].value);
            records_[i].items = wanted[i].is_list ? KLIBCSzListAlloc(4) : nullptr;
            for (const std::string &item : wanted[i].items) {
                KLIBCSzListPush(&records_[i].items, item.c_str());
            }
            records_[i].next = i + 1 < wanted.size() ? &records_[i + 1] : nullptr;
        }
        conf.options = wanted.empty() ? nullptr : records_.data();
    }
    void release() {
        for (const DHCP_OPTION &record : records_) {
            KLIBCSzListFree(record.items);
        }
        records_.clear();
    }
    void TearDown() override {
        release();
        unit_test::TearDown();
    }
    /** Writes a subnet with those of the options that the library takes, and leaves the others out of the list. */
    void write(const std::string &ifname, unsigned subnet, DHCP_TAG_CONF &conf, std::vector<option> &wanted) {
        for (;;) {
            hang(wanted, conf);
            const outcome got = rig.observe([&] { return DHCPTagConfSet(ifname.c_str(), subnet, 0, &conf); });
            if (got.result == 0) {
                return;
            }
            // the lines before the option that was refused are written
            const std::string lines = read_file(path_of(ifname, subnet));
            const size_t own = conf.domain[0] == '\0' ? 4 : 6;
            const auto written = static_cast<size_t>(std::count(lines.begin(), lines.end(), '\n')) - own;
            ASSERT_LT(written, wanted.size()) << got.str();
            refused_by_library.push_back(wanted[written]);
            wanted.erase(wanted.begin() + static_cast<long>(written));
        }
    }
    static std::string path_of(const std::string &ifname, unsigned subnet) {
        return "/etc/dhcpd/dhcpd-" + ifname + "-subnet" + std::to_string(subnet) + ".conf";
    }
    /** Reads a subnet and compares its options with what was written. */
    void expect_read_back(unsigned subnet, const std::vector<option> &written) {
        texts expected;
        for (const option &each : written) {
            if (!is_lost_when_read(each)) {
                expected.push_back(each.str());
            }
        }
        texts found;
        const outcome got = rig.observe([&] {
            DHCP_TAG_CONF conf{};
            const int result = DHCPTagConfGet("eth0", subnet, 0, &conf);
            for (const DHCP_OPTION *record = conf.options; record != nullptr; record = record->next) {
                option each{.number = record->number,
                            .name = record->name,
                            .is_list = record->items != nullptr,
                            .value = record->value};
                for (uint32_t i = 0; each.is_list && i < record->items->nItem; ++i) {
                    each.items.push_back(KLIBCSzListGet(record->items, static_cast<int>(i)));
                }
                found.push_back(each.str());
            }
            DHCPOptionFree(conf.options);
            return result;
        });
        EXPECT_EQ(1, got.result) << got.str();
        EXPECT_EQ(expected, found);
    }
    /** Lets the daemon read all fragments; every line that it refuses is a failure and taken out. */
    void expect_daemon_takes_all() {
        for (int refused = 0; refused < 20; ++refused) {
            const std::string said = refusal_of_daemon("'--conf-dir=/etc/dhcpd,*.conf'");
            if (said.empty()) {
                return;
            }
            std::smatch place;
            ASSERT_TRUE(std::regex_search(said, place, std::regex{"at line ([0-9]+) of (.*)"})) << said;
            const std::string path = place[2];
            const std::string line = place[1];
            ADD_FAILURE() << "seed " << seed << ": the daemon refuses what the library takes: " << said
                          << read_line(path, std::stoul(line));
            shell("sed -i " + line + "d " + path);
        }
    }
    static std::string read_line(const std::string &path, size_t number) {
        std::string rest = read_file(path);
        for (; number > 1; --number) {
            rest = rest.substr(rest.find('\n') + 1);
        }
        return rest.substr(0, rest.find('\n'));
    }
    /** Whether the daemon refuses a subnet that has this option alone. */
    bool is_refused_by_daemon(const option &tried) {
        const std::string alone = "e"; // shorter than any other, so that the value fits
        DHCP_TAG_CONF conf{};
        generator any{1};
        fill(any, conf);
        std::vector<option> wanted{tried};
        write(alone, 0, conf, wanted);
        EXPECT_EQ(1U, wanted.size()) << "the library refuses " << tried.str();
        const bool is_refused = !refusal_of_daemon("-C " + path_of(alone, 0)).empty();
        std::filesystem::remove(path_of(alone, 0));
        return is_refused;
    }

    const unsigned long seed = setting("KOVA_SEED", 1);
    const unsigned long rounds = setting("KOVA_ROUNDS", 500);
    std::vector<option> refused_by_library;

private:
    std::vector<DHCP_OPTION> records_;
};

TEST_F(dhcp_subnets, everyOptionTheLibraryTakes_isTakenByTheDaemonAndReadBack) {
    constexpr unsigned long kBatch = 250;
    generator any{seed};
    std::map<int, int> taken;
    std::map<const finding *, int> seen;
    for (unsigned long begin = 0; begin < rounds; begin += kBatch) {
        for (unsigned subnet = 0; subnet < std::min(kBatch, rounds - begin); ++subnet) {
            DHCP_TAG_CONF conf{};
            fill(any, conf);
            std::vector<option> wanted;
            for (uint64_t left = any.number(1, 8); left > 0; --left) {
                wanted.push_back(random_option(any));
            }
            write("eth0", subnet, conf, wanted);
            expect_read_back(subnet, wanted);
            for (const option &each : wanted) {
                ++taken[each.number];
            }
            const auto is_known = [&](const option &each) { return known(each) != nullptr; };
            for (const option &each : wanted) {
                if (is_known(each)) {
                    ++seen[known(each)];
                    EXPECT_TRUE(is_refused_by_daemon(each))
                        << "seed " << seed << ": no longer " << known(each)->what << ": " << each.str();
                }
            }
            wanted.erase(std::remove_if(wanted.begin(), wanted.end(), is_known), wanted.end());
            write("eth0", subnet, conf, wanted);
        }
        expect_daemon_takes_all();
        shell("rm -f /etc/dhcpd/*");
    }
    for (const kind &each : kKinds) {
        EXPECT_GT(taken[each.number], 0) << each.name << " was never taken";
    }
    // generated values are right but for their length
    for (const option &each : refused_by_library) {
        const bool is_long = each.line_value().size() > 900;
        EXPECT_TRUE(is_long) << each.str();
    }
    for (const finding &each : kRefusedByTheDaemon) {
        printf("%5d generated: %s (%s)\n", seen[&each], each.what, each.reason);
    }
}

TEST_F(dhcp_subnets, everyKnownFinding_isStillRefusedByTheDaemon) {
    for (const finding &each : kRefusedByTheDaemon) {
        EXPECT_EQ(&each, known(each.sample)) << each.what;
        EXPECT_TRUE(is_refused_by_daemon(each.sample)) << each.what << " (" << each.reason << ")";
    }
}

TEST_F(dhcp_subnets, everyRecord_isReadBackAsItWasWritten) {
    generator any{seed};
    for (unsigned long round = 0; round < rounds && !HasFailure(); ++round) {
        const int type = any.one_in(2) ? 0 : 1;
        const std::string ifname = any.name();
        const auto subnet = static_cast<unsigned>(any.one_in(2) ? any.number(0, 9) : any.number(0, UINT32_MAX));
        DHCP_TAG_CONF written{};
        written.enabled = static_cast<int>(any.number(0, 2));
        written.lease_time = static_cast<int>(any.number(0, UINT32_MAX));
        const size_t longest = type == 0 ? 19 : 45;
        set_field(written.start_ip, any.any_text(0, longest));
        set_field(written.end_ip, any.any_text(0, longest));
        set_field(written.netmask, any.any_text(0, 19));
        set_field(written.router, any.any_text(0, 19));
        set_field(written.domain, any.any_text(0, 254));
        set_field(written.v6_mode, any.one_of({"ra-only", "ra-stateless", "stateful"}));
        set_field(written.dns1, any.any_text(type, 45));
        set_field(written.dns2, any.any_text(0, 45));
        texts more;
        for (uint64_t left = any.number(0, 3); left > 0; --left) {
            more.push_back(type == 0 ? any.any_text(1, 45) : "[" + any.any_text(1, 43) + "]");
        }
        set_field(written.dns_more, joined(more));
        SCOPED_TRACE("seed " + std::to_string(seed) + ", round " + std::to_string(round));

        const outcome set = rig.observe([&] { return DHCPTagConfSet(ifname.c_str(), subnet, type, &written); });
        ASSERT_EQ(0, set.result) << set.str();
        DHCP_TAG_CONF read;
        memset(&read, 'x', sizeof read);
        const outcome get = rig.observe([&] { return DHCPTagConfGet(ifname.c_str(), subnet, type, &read); });
        ASSERT_EQ(1, get.result) << get.str();

        // name servers are one list in the fragment
        texts servers;
        for (const char *const server : {written.dns1, written.dns2}) {
            if (*server != '\0') {
                servers.push_back(server);
            }
        }
        for (const std::string &each : more) {
            servers.push_back(type == 0 ? each : each.substr(1, each.size() - 2));
        }
        servers.resize(2);
        EXPECT_EQ(servers[0], read.dns1);
        EXPECT_EQ(servers[1], read.dns2);
        EXPECT_EQ(written.enabled == 1 ? 1 : 0, read.enabled);
        EXPECT_EQ(written.lease_time, read.lease_time);
        EXPECT_EQ(nullptr, read.options);
        if (type == 0) {
            EXPECT_EQ(ifname.substr(0, 15), read.ifname);
            EXPECT_STREQ(written.start_ip, read.start_ip);
            EXPECT_STREQ(written.end_ip, read.end_ip);
            EXPECT_STREQ(written.netmask, read.netmask);
            EXPECT_STREQ(written.router, read.router);
            EXPECT_STREQ(written.domain, read.domain);
        } else {
            const bool is_stateful = strcmp(written.v6_mode, "stateful") == 0;
            EXPECT_STREQ(written.v6_mode, read.v6_mode);
            EXPECT_STREQ(is_stateful ? written.start_ip : "", read.start_ip);
            EXPECT_STREQ(is_stateful ? written.end_ip : "", read.end_ip);
        }
        for (const std::string &file : list_dir("/etc/dhcpd")) {
            std::filesystem::remove("/etc/dhcpd/" + file);
        }
    }
}
