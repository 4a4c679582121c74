#include "kova/plugin.h"

#include <algorithm>
#include <cctype>
#include <climits>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <pthread.h>
#include <string_view>
#include <sys/mman.h>
#include <sys/stat.h>

#include "common/list_ptr.h"
#include "common/report.h"
#include "common/steady_clock.h"
#include "kovacore/launch.h"

using namespace kova;
using std::string_view;

namespace {

constexpr const char *kPluginRoot = "/usr/kova/plugins";
constexpr const char *kCleanPath = "PATH=/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin";
constexpr int64_t kPluginLimitMs = 2000;
constexpr int64_t kActionLimitMs = 4000;

struct event_argument {
    event_argument *next;
    KLIBSZLIST *values;
    bool is_array;
    char key[]; // NUL-terminated
};

struct plugin_event {
    plugin_event *next;
    uint64_t handle;
    event_argument *arguments; // in the order in which they were first set
    char name[];               // NUL-terminated
};

plugin_event *g_events;
uint64_t g_last_handle;
pthread_mutex_t g_mutex = PTHREAD_MUTEX_INITIALIZER;

void free_event(plugin_event *event) {
    while (event_argument *argument = event->arguments) {
        event->arguments = argument->next;
        KLIBCSzListFree(argument->values);
        free(argument);
    }
    free(event);
}

plugin_event *find_event(uint64_t handle) {
    pthread_mutex_lock(&g_mutex);
    plugin_event *event = g_events;
    while (event != nullptr && event->handle != handle)
        event = event->next;
    pthread_mutex_unlock(&g_mutex);
    return event;
}

bool is_bad_component(string_view component) {
    const auto is_bad = [](unsigned char c) { return isalnum(c) == 0 && strchr("_.-", c) == nullptr; };
    return component.empty() || component.starts_with('.') || std::any_of(component.begin(), component.end(), is_bad);
}

/** The name becomes a path: it must not lead out of the plug-ins' directory. */
bool is_bad_event(const char *event) {
    string_view rest{event != nullptr ? event : ""};
    if (rest.size() > NAME_MAX)
        return true;
    for (size_t slash = rest.find('/'); slash != string_view::npos; slash = rest.find('/')) {
        if (is_bad_component({rest.data(), slash}))
            return true;
        rest.remove_prefix(slash + 1);
    }
    return is_bad_component(rest);
}

/** A key becomes a variable of the plug-ins' environment. */
bool is_bad_key(const char *key) {
    if (is_empty(key) || (isalpha(static_cast<unsigned char>(*key)) == 0 && *key != '_'))
        return true;
    const auto is_bad = [](unsigned char c) { return isalnum(c) == 0 && c != '_'; };
    const string_view name{key};
    return std::any_of(name.begin(), name.end(), is_bad) || name == "PATH" || name == "PLUGIN_EVENT" ||
           name == "PLUGIN_PHASE";
}

/** A newline would begin another line of the plug-ins' input. */
bool is_bad_value(const char *value) {
    return value == nullptr || strchr(value, '\n') != nullptr;
}

event_argument **find_argument(plugin_event &event, const char *key) {
    event_argument **link = &event.arguments;
    while (*link != nullptr && strcmp((*link)->key, key) != 0)
        link = &(*link)->next;
    return link;
}

int set_argument(uint64_t handle, const char *key, const char *const *values, int count, bool is_array) {
    plugin_event *event = find_event(handle);
    if (event == nullptr || is_bad_key(key) || std::any_of(values, values + count, is_bad_value))
        return fail(HERE, kErrArgument);

    list_ptr list{KLIBCSzListAlloc(std::max(count, 1))};
    if (!list)
        return -1;
    KLIBSZLIST *items = list.get();
    for (int i = 0; i < count; i++)
        if (KLIBCSzListPush(&items, values[i]) < 0)
            return -1;
    event_argument **link = find_argument(*event, key);
    if (*link == nullptr) {
        *link = static_cast<event_argument *>(calloc(1, sizeof(event_argument) + strlen(key) + 1));
        if (*link == nullptr)
            return fail(HERE, kErrMemory);
        memcpy((*link)->key, key, strlen(key) + 1);
    }
    KLIBCSzListFree((*link)->values);
    (*link)->values = list.release();
    (*link)->is_array = is_array;
    return 0;
}

/** Appends "<key><suffix>=<value>". */
bool add_variable(KLIBSZLIST *variables, const char *key, const char *suffix, const char *value) {
    char *text = nullptr;
    if (asprintf(&text, "%s%s=%s", key, suffix, value) < 0)
        return fail(HERE, kErrMemory), false;
    const heap_ptr<char> owner{text};
    return KLIBCSzListPush(&variables, text) == 0;
}

bool add_argument(KLIBSZLIST *variables, const event_argument &argument) {
    if (!argument.is_array)
        return add_variable(variables, argument.key, "", KLIBCSzListGet(argument.values, 0));
    char number[16];
    snprintf(number, sizeof number, "%u", argument.values->nItem);
    bool added = add_variable(variables, argument.key, "_COUNT", number);
    for (uint32_t i = 0; added && i < argument.values->nItem; i++) {
        snprintf(number, sizeof number, "_%u", i + 1);
        added = add_variable(variables, argument.key, number, KLIBCSzListGet(argument.values, static_cast<int>(i)));
    }
    return added;
}

/** Everything a plug-in is told, as "key=value" texts. */
list_ptr make_variables(const plugin_event &event, int phase) {
    list_ptr variables{KLIBCSzListAlloc(32)};
    bool added = variables && add_variable(variables.get(), "PLUGIN_EVENT", "", event.name) &&
                 add_variable(variables.get(), "PLUGIN_PHASE", "", phase == KLIB_PLUGIN_PRE ? "PRE" : "POST");
    for (const event_argument *argument = event.arguments; added && argument != nullptr; argument = argument->next)
        added = add_argument(variables.get(), *argument);
    return added ? std::move(variables) : nullptr;
}

heap_ptr<char *> make_environment(const KLIBSZLIST &variables) {
    heap_ptr<char *> environment{static_cast<char **>(malloc((variables.nItem + 2) * sizeof(char *)))};
    if (!environment)
        return fail(HERE, kErrMemory), nullptr;
    std::copy(variables.ppszItem, variables.ppszItem + variables.nItem, environment.get());
    environment.get()[variables.nItem] = const_cast<char *>(kCleanPath);
    environment.get()[variables.nItem + 1] = nullptr;
    return environment;
}

/** The standard input of the plug-ins: a file in memory never fills up and waits for nobody to read it. */
unique_fd make_input(const KLIBSZLIST &variables) {
    unique_fd fd{memfd_create("plugin", MFD_CLOEXEC | MFD_ALLOW_SEALING)};
    bool written = static_cast<bool>(fd);
    for (uint32_t i = 0; written && i < variables.nItem; i++)
        written = dprintf(fd.get(), "%s\n", variables.ppszItem[i]) > 0;
    if (!written || fcntl(fd.get(), F_ADD_SEALS, F_SEAL_WRITE | F_SEAL_SHRINK | F_SEAL_GROW) < 0)
        return fail(HERE, kErrMemory), unique_fd{};
    return fd;
}

bool is_executable_file(const char *path) {
    struct stat status;
    return stat(path, &status) == 0 && S_ISREG(status.st_mode) && access(path, X_OK) == 0;
}

/** One run of the plug-ins of an event. */
struct plugin_run {
    char *const *environment;
    int input;
    int64_t deadline;
};

/** @return whether it ended by itself with status 0 */
bool run_plugin(const char *path, const plugin_run &run) {
    const int64_t left = run.deadline - steady_ms();
    if (left <= 0)
        return false;
    const char *const argv[] = {path, nullptr};
    const heap_ptr<char> trace = trace_command(argv);
    lseek(run.input, 0, SEEK_SET);
    const started child = start_program({.program = path,
                                         .argv = argv,
                                         .environment = run.environment,
                                         .standard_input = run.input,
                                         .own_group = true});
    const int status = child.failure != 0
                           ? child.failure
                           : wait_for_program(child.pid, static_cast<int>(std::min(left, kPluginLimitMs)));
    trace_result(trace.get(), status);
    return status == 0;
}

int run_plugins(const char *event, const KLIBSZLIST &names, const plugin_run &run) {
    bool all_ran = true;
    for (uint32_t i = 0; i < names.nItem; i++) {
        char path[PATH_MAX];
        snprintf(path, sizeof path, "%s/%s/%s", kPluginRoot, event, names.ppszItem[i]);
        if (is_executable_file(path) && !run_plugin(path, run))
            all_ran = false;
    }
    return all_ran ? 0 : fail(HERE, kErrExec);
}

} // namespace

int KLIBPluginSDKInit(const char *szComponent, const char *szEvent, uint64_t *pHandle) {
    if (pHandle != nullptr)
        *pHandle = 0;
    const string_view component{szComponent != nullptr ? szComponent : ""};
    if ((component != "net" && component != "service") || is_bad_event(szEvent) || pHandle == nullptr)
        return fail(HERE, kErrArgument);

    auto *event = static_cast<plugin_event *>(calloc(1, sizeof(plugin_event) + strlen(szEvent) + 1));
    if (event == nullptr)
        return fail(HERE, kErrMemory);
    memcpy(event->name, szEvent, strlen(szEvent) + 1);
    pthread_mutex_lock(&g_mutex);
    event->handle = ++g_last_handle;
    event->next = g_events;
    g_events = event;
    pthread_mutex_unlock(&g_mutex);
    *pHandle = event->handle;
    return 0;
}

int KLIBPluginHasInit(uint64_t handle) {
    return find_event(handle) != nullptr ? 1 : 0;
}

int KLIBPluginSetArg(uint64_t handle, const char *szKey, const char *szValue) {
    return set_argument(handle, szKey, &szValue, 1, false);
}

int KLIBPluginSetArgByInt(uint64_t handle, const char *szKey, int value) {
    char text[16];
    snprintf(text, sizeof text, "%d", value);
    return KLIBPluginSetArg(handle, szKey, text);
}

int KLIBPluginSetArgByArray(uint64_t handle, const char *szKey, const char *const *ppszValue, int count) {
    if (count < 0 || (ppszValue == nullptr && count > 0))
        return fail(HERE, kErrArgument);
    return set_argument(handle, szKey, ppszValue, count, true);
}

int KLIBPluginAction(int phase, uint64_t handle) {
    const plugin_event *event = find_event(handle);
    if (event == nullptr || (phase != KLIB_PLUGIN_PRE && phase != KLIB_PLUGIN_POST))
        return fail(HERE, kErrArgument);

    char directory[PATH_MAX];
    snprintf(directory, sizeof directory, "%s/%s", kPluginRoot, event->name);
    if (!KLIBCFileCheckDir(directory))
        return 0;
    const list_ptr names{KLIBCSzListAlloc(16)};
    if (!names || KLIBCFileEnumDir(directory, names.get(), nullptr, 64) < 0)
        return -1;
    const list_ptr variables = make_variables(*event, phase);
    const heap_ptr<char *> environment = variables ? make_environment(*variables) : nullptr;
    const unique_fd input = environment ? make_input(*variables) : unique_fd{};
    if (!input)
        return -1;
    return run_plugins(event->name, *names, {environment.get(), input.get(), steady_ms() + kActionLimitMs});
}

int KLIBPluginExit(uint64_t handle) {
    pthread_mutex_lock(&g_mutex);
    plugin_event **link = &g_events;
    while (*link != nullptr && (*link)->handle != handle)
        link = &(*link)->next;
    plugin_event *event = *link;
    if (event != nullptr)
        *link = event->next;
    pthread_mutex_unlock(&g_mutex);
    if (event != nullptr)
        free_event(event);
    return 0;
}
