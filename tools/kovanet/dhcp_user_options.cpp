// kovanet dhcp-server option: what an IPv4 subnet hands out beside router, name servers and domain.
#include "dhcp_options.h"
#include "dhcp_subnet.h"
#include "lists.h"
#include "words.h"

#include <cstdlib>

namespace kova {
namespace {

struct option_words : subnet_words {
    std::string name;
    std::vector<std::string> values;
};

json rows_of(const subnet &one) {
    json rows = json::array();
    for (const DHCP_OPTION *option = one.options.get(); option != nullptr; option = option->next) {
        const bool is_list = DHCPOptionIsListValue(static_cast<unsigned>(option->number)) == 1;
        rows.push_back({{"number", option->number},
                        {"name", option->name},
                        {"values", is_list ? texts_of(option->items) : std::vector<std::string>{option->value}}});
    }
    return rows;
}

constexpr column kColumns[] = {
    {"NUMBER", [](const json &row) { return field(row, "number"); }, true},
    {"NAME", [](const json &row) { return field(row, "name"); }},
    {"VALUE", [](const json &row) { return words_field(row, "values"); }},
};

void list(const subnet_id &id, bool as_json) {
    const config_lock lock{config_lock::kShared};
    const json rows = rows_of(require_subnet(id));
    show_table(rows, kColumns, as_json);
}

/** Where the option of a number hangs, or where one is to be appended. */
DHCP_OPTION **place_of(subnet &one, DHCP_OPTION *&head, int number) {
    head = one.options.release();
    DHCP_OPTION **place = &head;
    while (*place != nullptr && (*place)->number != number) {
        place = &(*place)->next;
    }
    return place;
}

/** Takes an option out of a subnet. @return whether it was there */
bool take_out(subnet &one, int number) {
    DHCP_OPTION *head = nullptr;
    DHCP_OPTION **const place = place_of(one, head, number);
    DHCP_OPTION *const found = *place;
    if (found != nullptr) {
        *place = found->next;
        found->next = nullptr;
    }
    const owned_options gone{found};
    one.options.reset(head);
    return found != nullptr;
}

owned_options make_option(const option_kind &kind, const std::vector<std::string> &values) {
    owned_options option{static_cast<DHCP_OPTION *>(calloc(1, sizeof(DHCP_OPTION)))};
    if (option == nullptr) {
        throw failure{kCallFailed, "not enough memory"};
    }
    option->number = kind.number;
    put(option->name, kind.name);
    if (DHCPOptionIsListValue(static_cast<unsigned>(kind.number)) == 1) {
        option->items = make_list(values).release();
    } else {
        put(option->value, values[0]);
    }
    return option;
}

/** Puts an option in the place of the old one, or behind all others. */
void put_in(subnet &one, owned_options option) {
    DHCP_OPTION *head = nullptr;
    DHCP_OPTION **const place = place_of(one, head, option->number);
    const owned_options old{*place};
    if (old != nullptr) {
        option->next = old->next;
        old->next = nullptr;
    }
    *place = option.release();
    one.options.reset(head);
}

/** The line that an option makes in the server's file. */
std::string line_of(const subnet_id &id, const option_kind &kind, const std::vector<std::string> &values) {
    return "dhcp-option=tag:" + tag_of(id) + ",option:" + kind.name + "," + CLI::detail::join(values, ",");
}

void set(const option_words &words) {
    const subnet_id id = words.id();
    const option_kind &kind = require_option(words.name);
    const std::vector<std::string> values = require_values(kind, words.values);
    require(std::string("option ") + kind.name, refuse_server_line(line_of(id, kind, values)));
    change_server([&] {
        subnet one = require_subnet(id);
        require_all_known(one);
        put_in(one, make_option(kind, values));
        write_subnet(one);
    });
}

void del(const option_words &words) {
    const subnet_id id = words.id();
    const option_kind &kind = require_option(words.name);
    change_server([&] {
        subnet one = require_subnet(id);
        require_all_known(one);
        if (!take_out(one, kind.number)) {
            throw failure{kNotFound, std::string("the subnet has no option ") + kind.name};
        }
        write_subnet(one);
    });
}

} // namespace

void add_option_verbs(CLI::App &object, const global_options &options) {
    auto &words = words_of<option_words>();
    CLI::App &all = *object.add_subcommand("option", "what an IPv4 subnet hands out beside router, servers and domain");
    CLI::App &list_verb = *all.add_subcommand("list", "the options of a subnet");
    add_subnet_words(list_verb, words);
    list_verb.callback([&words, &options] { list(words.id(), options.json); });

    CLI::App &change = add_change(all, "set", "set an option, in place of the one there was");
    add_subnet_words(change, words);
    change.add_option("NAME", words.name, "name or number of the option")->required();
    add_words(change, "VALUE", words.values,
              "as the option takes it, or several of a list; a refused one is told what that is")
        .required();
    change.callback([&words] { set(words); });

    CLI::App &gone = add_change(all, "del", "hand an option out no more");
    add_subnet_words(gone, words);
    gone.add_option("NAME", words.name, "name or number of the option")->required();
    gone.callback([&words] { del(words); });
}

} // namespace kova
