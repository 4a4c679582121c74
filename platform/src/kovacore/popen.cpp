#include "kova/core.h"

#include <cstdarg>
#include <cstring>
#include <fcntl.h>
#include <pthread.h>
#include <utility>

#include "common/arguments.h"
#include "common/report.h"
#include "kovacore/launch.h"

using namespace kova;

namespace {

/** A stream that is open, and the program behind it. */
struct open_stream {
    FILE *stream;
    pid_t pid;
    char *trace; // NULL unless commands are traced
    open_stream *next;
};

open_stream *g_streams;
pthread_mutex_t g_mutex = PTHREAD_MUTEX_INITIALIZER;

struct open_stream_deleter {
    void operator()(open_stream *entry) const {
        free(entry->trace);
        free(entry);
    }
};
using open_stream_ptr = std::unique_ptr<open_stream, open_stream_deleter>;

void remember(open_stream_ptr entry) {
    pthread_mutex_lock(&g_mutex);
    entry->next = g_streams;
    g_streams = entry.release();
    pthread_mutex_unlock(&g_mutex);
}

open_stream_ptr forget(const FILE *stream) {
    pthread_mutex_lock(&g_mutex);
    open_stream **link = &g_streams;
    while (*link != nullptr && (*link)->stream != stream)
        link = &(*link)->next;
    open_stream_ptr entry{*link};
    if (entry)
        *link = entry->next;
    pthread_mutex_unlock(&g_mutex);
    return entry;
}

struct stream_closer {
    void operator()(FILE *stream) const { fclose(stream); }
};
using stream_ptr = std::unique_ptr<FILE, stream_closer>;

/** The two ends of a pipe: what is read here, and what the program writes to. */
struct pipe_ends {
    stream_ptr reader;
    unique_fd writer;
};

bool open_pipe(pipe_ends &ends) {
    int fds[2];
    if (pipe2(fds, O_CLOEXEC) < 0)
        return false;
    unique_fd reader{fds[0]};
    ends.writer.reset(fds[1]);
    ends.reader.reset(fdopen(reader.get(), "r"));
    if (ends.reader)
        (void)reader.release();
    return static_cast<bool>(ends.reader);
}

FILE *open_program(const char *program, const char *const *argv) {
    open_stream_ptr entry{static_cast<open_stream *>(calloc(1, sizeof(open_stream)))};
    pipe_ends ends;
    if (!entry)
        return fail(HERE, kErrMemory), nullptr;
    if (!open_pipe(ends))
        return fail(HERE, kErrExec), nullptr;

    entry->trace = trace_command(argv).release();
    const started child = start_program({.program = program, .argv = argv, .standard_output = ends.writer.get()});
    if (child.failure != 0) {
        trace_result(entry->trace, child.failure);
        return fail(HERE, kErrExec), nullptr;
    }
    entry->pid = child.pid;
    entry->stream = ends.reader.get();
    remember(std::move(entry));
    return ends.reader.release();
}

} // namespace

FILE *KLIBCPopen(const char *szProgram, const char *szMode, ...) {
    if (szProgram == nullptr || *szProgram != '/' || szMode == nullptr || strcmp(szMode, "r") != 0)
        return fail(HERE, kErrArgument), nullptr;

    va_list list;
    va_start(list, szMode);
    const heap_ptr<const char *> argv = make_argv(szProgram, list);
    va_end(list);
    return argv ? open_program(szProgram, argv.get()) : (fail(HERE, kErrMemory), nullptr);
}

int KLIBCPclose(FILE *pStream) {
    if (pStream == nullptr)
        return fail(HERE, kErrArgument);
    const open_stream_ptr entry = forget(pStream);
    if (!entry)
        return fail(HERE, kErrArgument);

    fclose(pStream);
    const int status = wait_for_program(entry->pid);
    trace_result(entry->trace, status);
    return status == kNoProcess ? fail(HERE, kErrExec) : status;
}
