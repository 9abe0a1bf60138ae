// Preloaded into the agent by scripts/faults: counts the agent's calls of libc, and fails one of them, or ends the
// process in its place. FAILING_CALLS names the file that keeps the counts, also over an execution anew. FAILING_CALL,
// CALL:K:MODE, is the K-th call from the beginning of that file: it alone fails (once), it and all that follow (on), or
// the process is killed instead (kill). Other programs that the agent starts are left alone.
//
// Uses nothing of the C++ library: the agent has its own.
#include <dirent.h>
#include <dlfcn.h>
#include <fcntl.h>
#include <poll.h>
#include <pthread.h>
#include <spawn.h>
#include <sys/epoll.h>
#include <sys/mman.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <cstring>

extern "C" void* __libc_malloc(std::size_t size);
extern "C" void* __libc_calloc(std::size_t count, std::size_t size);
extern "C" void* __libc_realloc(void* memory, std::size_t size);

namespace {

// A record of the file. The first tells how many calls have failed.
struct Count {
    char name[24];
    std::uint64_t number;
};
constexpr std::size_t mostCounts = 128;

enum class Mode { Once, On, Kill };

struct Call {
    Call(const char* name, int error, int otherError) : name(name), errors{error, otherError}, next(first) {
        first = this;
    }
    void* real() {
        if (!real_) real_ = dlsym(RTLD_NEXT, name);
        return real_;
    }
    bool isToFail();

    static inline Call* first = nullptr;
    const char* const name;
    const int errors[2];  // the first for good, both once, in turn
    Call* const next;
    Count* count = nullptr;

private:
    void* real_ = nullptr;
};

Count* failures = nullptr;
const Call* chosen = nullptr;
std::uint64_t position = 0;
Mode mode = Mode::Once;

bool Call::isToFail() {
    if (!count) return false;  // not set up yet
    const std::uint64_t number = __atomic_add_fetch(&count->number, 1, __ATOMIC_RELAXED);
    if (this != chosen || number < position || (number > position && mode != Mode::On)) return false;
    __atomic_add_fetch(&failures->number, 1, __ATOMIC_RELAXED);
    if (mode == Mode::Kill) kill(getpid(), SIGKILL);
    errno = errors[mode == Mode::On ? 0 : position % 2];
    return true;
}

}  // namespace

// The functions have names of their own here, because the headers declare some of them differently; the linker knows
// them by the real ones. Arguments that a caller may leave out are passed on, whatever they are.
#define NAMED(type, name, parameters) extern "C" type failing_##name parameters asm(#name)
#define FAILING(type, name, parameters, arguments, error, otherError, failure)     \
    static Call call_##name(#name, error, otherError);                             \
    NAMED(type, name, parameters);                                                 \
    type failing_##name parameters {                                               \
        if (call_##name.isToFail()) return failure;                                \
        return reinterpret_cast<type(*) parameters>(call_##name.real()) arguments; \
    }
#define FAILING_INT(name, parameters, arguments, error, otherError) \
    FAILING(int, name, parameters, arguments, error, otherError, -1)
#define FAILING_SIZE(name, parameters, arguments, error, otherError) \
    FAILING(ssize_t, name, parameters, arguments, error, otherError, -1)
// A second name, for large files, which are all files here.
#define ALIAS(name) ".globl " #name "64; .set " #name "64, " #name "\n"

using Size = std::size_t;
using Path = const char*;
using Length = socklen_t;

FAILING_INT(open, (Path path, int flags, mode_t mode), (path, flags, mode), EMFILE, EINTR)
FAILING_INT(openat, (int folder, Path path, int flags, mode_t mode), (folder, path, flags, mode), EMFILE, ENOMEM)
FAILING(FILE*, fopen, (Path path, Path how), (path, how), EMFILE, ENOMEM, nullptr)
FAILING_SIZE(read, (int file, void* bytes, Size size), (file, bytes, size), EIO, EINTR)
FAILING_SIZE(pread, (int file, void* bytes, Size size, off_t at), (file, bytes, size, at), EIO, EINTR)
FAILING_SIZE(write, (int file, const void* bytes, Size size), (file, bytes, size), ENOSPC, EIO)
FAILING_SIZE(writev, (int file, const iovec* parts, int count), (file, parts, count), EPIPE, EIO)
FAILING_SIZE(pwrite, (int file, const void* bytes, Size size, off_t at), (file, bytes, size, at), ENOSPC, EIO)
FAILING_INT(fsync, (int file), (file), EIO, ENOSPC)
FAILING_INT(fdatasync, (int file), (file), EIO, ENOSPC)
FAILING_INT(ftruncate, (int file, off_t size), (file, size), EIO, EINTR)
FAILING_INT(fstat, (int file, struct stat* status), (file, status), EIO, ENOMEM)
FAILING_INT(stat, (Path path, struct stat* status), (path, status), EIO, EACCES)
FAILING_INT(lstat, (Path path, struct stat* status), (path, status), EIO, EACCES)
FAILING_INT(fstatat, (int folder, Path path, struct stat* status, int flags), (folder, path, status, flags), EIO,
            ENOMEM)
FAILING_INT(statx, (int folder, Path path, int flags, unsigned mask, void* status), (folder, path, flags, mask, status),
            EIO, ENOMEM)
FAILING_INT(access, (Path path, int how), (path, how), EIO, EACCES)
FAILING_INT(flock, (int file, int how), (file, how), ENOLCK, EINTR)
FAILING_INT(dup2, (int file, int number), (file, number), EMFILE, EINTR)
FAILING_INT(rename, (Path from, Path to), (from, to), EIO, ENOSPC)
FAILING_INT(link, (Path from, Path to), (from, to), EIO, ENOSPC)
FAILING_INT(unlink, (Path path), (path), EIO, EROFS)
FAILING_INT(mkdir, (Path path, mode_t mode), (path, mode), ENOSPC, EIO)
FAILING_INT(chmod, (Path path, mode_t mode), (path, mode), EIO, EPERM)
FAILING_INT(fchmod, (int file, mode_t mode), (file, mode), EIO, EPERM)
FAILING_SIZE(readlink, (Path path, char* text, Size size), (path, text, size), EIO, EACCES)
FAILING_SIZE(readlinkat, (int folder, Path path, char* text, Size size), (folder, path, text, size), EIO, EACCES)
FAILING(char*, realpath, (Path path, char* text), (path, text), EIO, ENOMEM, nullptr)
FAILING(DIR*, opendir, (Path path), (path), EMFILE, ENOMEM, nullptr)
FAILING(DIR*, fdopendir, (int file), (file), ENOMEM, EMFILE, nullptr)
FAILING(dirent*, readdir, (DIR * folder), (folder), EIO, EBADF, nullptr)
FAILING(void*, mmap, (void* at, Size size, int protection, int flags, int file, off_t from),
        (at, size, protection, flags, file, from), ENOMEM, EAGAIN, MAP_FAILED)
FAILING(void*, mremap, (void* at, Size size, Size newSize, int flags), (at, size, newSize, flags), ENOMEM, EAGAIN,
        MAP_FAILED)
FAILING_INT(socket, (int domain, int type, int protocol), (domain, type, protocol), EMFILE, ENOBUFS)
FAILING_INT(socketpair, (int domain, int type, int protocol, int* pair), (domain, type, protocol, pair), EMFILE, ENOMEM)
FAILING_INT(bind, (int file, const sockaddr* address, Length size), (file, address, size), EADDRINUSE, ENOSPC)
FAILING_INT(listen, (int file, int length), (file, length), EADDRINUSE, ENOMEM)
FAILING_INT(accept4, (int file, sockaddr* address, Length* size, int flags), (file, address, size, flags), EMFILE,
            ECONNABORTED)
FAILING_INT(connect, (int file, const sockaddr* address, Length size), (file, address, size), ECONNREFUSED, ENETUNREACH)
FAILING_INT(getsockname, (int file, sockaddr* address, Length* size), (file, address, size), ENOBUFS, ENOMEM)
FAILING_INT(getsockopt, (int file, int level, int name, void* value, Length* size), (file, level, name, value, size),
            ENOBUFS, ENOMEM)
FAILING_INT(setsockopt, (int file, int level, int name, const void* value, Length size),
            (file, level, name, value, size), ENOBUFS, ENOMEM)
FAILING_SIZE(send, (int file, const void* bytes, Size size, int flags), (file, bytes, size, flags), ECONNRESET, EINTR)
FAILING_SIZE(sendto, (int file, const void* bytes, Size size, int flags, const sockaddr* to, Length length),
             (file, bytes, size, flags, to, length), ENOBUFS, EINTR)
FAILING_SIZE(sendmsg, (int file, const msghdr* message, int flags), (file, message, flags), EPIPE, ENOBUFS)
FAILING_SIZE(recv, (int file, void* bytes, Size size, int flags), (file, bytes, size, flags), ECONNRESET, EINTR)
FAILING_SIZE(recvfrom, (int file, void* bytes, Size size, int flags, sockaddr* from, Length* length),
             (file, bytes, size, flags, from, length), ECONNRESET, EINTR)
FAILING_SIZE(recvmsg, (int file, msghdr* message, int flags), (file, message, flags), ECONNRESET, EINTR)
FAILING_INT(poll, (pollfd * files, nfds_t count, int limit), (files, count, limit), ENOMEM, EINTR)
FAILING_INT(ppoll, (pollfd * files, nfds_t count, const timespec* limit, const sigset_t* signals),
            (files, count, limit, signals), ENOMEM, EINTR)
FAILING_INT(epoll_create1, (int flags), (flags), EMFILE, ENOMEM)
FAILING_INT(epoll_ctl, (int loop, int operation, int file, epoll_event* event), (loop, operation, file, event), ENOSPC,
            ENOMEM)
FAILING_INT(eventfd, (unsigned count, int flags), (count, flags), EMFILE, ENOMEM)
FAILING_INT(signalfd, (int file, const sigset_t* signals, int flags), (file, signals, flags), EMFILE, ENOMEM)
FAILING_INT(timerfd_create, (int clock, int flags), (clock, flags), EMFILE, ENOMEM)
FAILING_INT(timerfd_settime, (int file, int flags, const itimerspec* time, itimerspec* before),
            (file, flags, time, before), ECANCELED, EINVAL)
FAILING_INT(inotify_init1, (int flags), (flags), EMFILE, ENOMEM)
FAILING_INT(inotify_add_watch, (int file, Path path, std::uint32_t events), (file, path, events), ENOSPC, ENOMEM)
FAILING_INT(pipe2, (int* pair, int flags), (pair, flags), EMFILE, ENFILE)
FAILING_INT(execv, (Path path, char* const* arguments), (path, arguments), ENOMEM, EIO)
FAILING(int, posix_spawn,
        (pid_t * process, Path path, const void* actions, const void* attributes, char* const* arguments,
         char* const* environment),
        (process, path, actions, attributes, arguments, environment), EAGAIN, ENOMEM, errno)
FAILING(int, pthread_create,
        (pthread_t * thread, const pthread_attr_t* attributes, void* (*run)(void*), void* argument),
        (thread, attributes, run, argument), EAGAIN, ENOMEM, errno)
FAILING_SIZE(getrandom, (void* bytes, Size size, unsigned flags), (bytes, size, flags), ENOSYS, EAGAIN)
FAILING_INT(getentropy, (void* bytes, Size size), (bytes, size), ENOSYS, EIO)

asm(ALIAS(open) ALIAS(openat) ALIAS(fopen) ALIAS(pread) ALIAS(pwrite) ALIAS(ftruncate) ALIAS(fstat) ALIAS(stat)
        ALIAS(lstat) ALIAS(fstatat) ALIAS(fcntl) ALIAS(readdir) ALIAS(mmap));

// The file is closed in any case.
static Call call_close("close", EIO, EINTR);
NAMED(int, close, (int file));
int failing_close(int file) {
    const bool isToFail = call_close.isToFail();
    const int error = errno;
    const int result = reinterpret_cast<int (*)(int)>(call_close.real())(file);
    if (!isToFail) return result;
    errno = error;
    return -1;
}

// Locks of a part of a file can always be given back.
static Call call_fcntl("fcntl", EIO, ENOLCK);
NAMED(int, fcntl, (int file, int command, void* argument));
int failing_fcntl(int file, int command, void* argument) {
    const bool isUnlock = command == F_SETLK && static_cast<const struct flock*>(argument)->l_type == F_UNLCK;
    if (!isUnlock && call_fcntl.isToFail()) return -1;
    return reinterpret_cast<int (*)(int, int, void*)>(call_fcntl.real())(file, command, argument);
}

// All that allocates counts as one call. What finds the others allocates, so these go by names of the library's own.
static Call call_malloc("malloc", ENOMEM, ENOMEM);
NAMED(void*, malloc, (Size size));
void* failing_malloc(Size size) {
    return call_malloc.isToFail() ? nullptr : __libc_malloc(size);
}
NAMED(void*, calloc, (Size count, Size size));
void* failing_calloc(Size count, Size size) {
    return call_malloc.isToFail() ? nullptr : __libc_calloc(count, size);
}
NAMED(void*, realloc, (void* memory, Size size));
void* failing_realloc(void* memory, Size size) {
    return call_malloc.isToFail() ? nullptr : __libc_realloc(memory, size);
}

// After the calls above: takes up the file, in which a call keeps its place from one execution to the next.
static const bool isSetUp = [] {
    const char* path = getenv("FAILING_CALLS");
    if (!path || std::strcmp(program_invocation_short_name, "vrxagent") != 0) return false;
    constexpr Size size = mostCounts * sizeof(Count);
    const int file = open(path, O_RDWR | O_CLOEXEC);
    void* memory = mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_SHARED, file, 0);
    close(file);
    if (file < 0 || memory == MAP_FAILED) abort();
    failures = static_cast<Count*>(memory);
    if (const char* wanted = getenv("FAILING_CALL")) {
        const char* number = std::strchr(wanted, ':');
        char* way = nullptr;
        position = std::strtoull(number + 1, &way, 10);
        mode = std::strcmp(way, ":on") == 0 ? Mode::On : std::strcmp(way, ":kill") == 0 ? Mode::Kill : Mode::Once;
        for (Call* call = Call::first; call; call = call->next)
            if (std::strncmp(call->name, wanted, static_cast<Size>(number - wanted)) == 0 &&
                call->name[number - wanted] == 0)
                chosen = call;
        if (!chosen) abort();
    }
    Count* record = failures;
    for (Call* call = Call::first; call; call = call->next) {
        std::strncpy((++record)->name, call->name, sizeof record->name - 1);
        call->count = record;
    }
    return true;
}();
