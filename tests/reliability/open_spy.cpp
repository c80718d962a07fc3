// Preloaded into hadrocli by files_test: logs every open of a file (path, flags, mode) to the
// file named by $OPEN_SPY_LOG, one line each, then opens it as asked.
#include <dlfcn.h>
#include <fcntl.h>
#include <unistd.h>

#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>

namespace {

void Log(const char* path, int flags, unsigned mode) {
    const char* log = std::getenv("OPEN_SPY_LOG");
    if (!log || !path) return;
    using OpenFunction = int (*)(const char*, int, ...);
    static auto real = reinterpret_cast<OpenFunction>(dlsym(RTLD_NEXT, "open"));
    int fd = real(log, O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0600);
    if (fd < 0) return;
    char line[4200];
    int n = std::snprintf(line, sizeof(line), "%d %o %s\n", flags, mode, path);
    if (n > 0) {
        ssize_t ignored = write(fd, line, static_cast<std::size_t>(n) < sizeof(line) ? n : sizeof(line) - 1);
        (void)ignored;
    }
    close(fd);
}

template <class Function>
Function Next(const char* name) {
    return reinterpret_cast<Function>(dlsym(RTLD_NEXT, name));
}

unsigned ModeOf(int flags, va_list args) {
    return (flags & O_CREAT) || (flags & O_TMPFILE) == O_TMPFILE ? va_arg(args, unsigned) : 0;
}

}  // namespace

#define SPY_OPEN(NAME)                                                       \
    extern "C" int NAME(const char* path, int flags, ...) {                  \
        va_list args;                                                        \
        va_start(args, flags);                                               \
        unsigned mode = ModeOf(flags, args);                                 \
        va_end(args);                                                        \
        Log(path, flags, mode);                                              \
        static auto real = Next<int (*)(const char*, int, ...)>(#NAME);      \
        return real(path, flags, mode);                                      \
    }
#define SPY_OPENAT(NAME)                                                     \
    extern "C" int NAME(int dir, const char* path, int flags, ...) {         \
        va_list args;                                                        \
        va_start(args, flags);                                               \
        unsigned mode = ModeOf(flags, args);                                 \
        va_end(args);                                                        \
        Log(path, flags, mode);                                              \
        static auto real = Next<int (*)(int, const char*, int, ...)>(#NAME); \
        return real(dir, path, flags, mode);                                 \
    }

SPY_OPEN(open)
SPY_OPEN(open64)
SPY_OPENAT(openat)
SPY_OPENAT(openat64)
