#include "confirm.h"

#include "errors.h"
#include "table.h"

#include <cstdio>
#include <unistd.h>

namespace kova {
namespace {

bool is_yes(const char *line) {
    const std::string answer{line, strcspn(line, "\r\n")};
    return answer == "y" || answer == "Y" || answer == "yes";
}

} // namespace

void add_yes(CLI::App &command, bool &is_confirmed) {
    command.add_flag("--yes", is_confirmed, "do it without asking, as in a script");
}

void confirm(const std::vector<std::string> &effects, bool is_confirmed) {
    if (is_confirmed) {
        return;
    }
    if (isatty(STDIN_FILENO) != 1 || isatty(STDERR_FILENO) != 1) {
        throw failure{kUsage,
                      "this asks before it changes addresses, and there is no terminal to ask on; with --yes it "
                      "is done unasked"};
    }
    for (const std::string &effect : effects) {
        fprintf(stderr, "%s\n", printable(effect).c_str());
    }
    fputs("Continue? [y/N] ", stderr);
    char line[16] = "";
    if (fgets(line, sizeof line, stdin) == nullptr || !is_yes(line)) {
        throw failure{kNo, "nothing was changed"};
    }
}

} // namespace kova
