#include "host/call_faults.h"

#include <fcntl.h>
#include <sqlite3.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

namespace vrx {

namespace {

struct Plan {
    CallFaults::Kind kind = CallFaults::Kind::None;
    int left = 0;  // calls until the one that fails
    bool isForGood = false;
    bool hasFailed = false;
};
thread_local Plan plan;

bool fails(CallFaults::Kind kind) {
    const bool isMeant = kind == plan.kind || (kind == CallFaults::Kind::Read && plan.kind == CallFaults::Kind::Call);
    if (!isMeant || (plan.left == 0 && !plan.isForGood)) return false;
    if (plan.left > 0 && --plan.left > 0) return false;
    return plan.hasFailed = true;
}

bool isPlanned() {
    return plan.kind != CallFaults::Kind::None;
}

bool callFails(CallFaults::Kind kind = CallFaults::Kind::Call) {
    if (!fails(kind)) return false;
    errno = EIO;
    return true;
}

sqlite3_mem_methods allocator;
sqlite3_vfs* system_ = nullptr;

// The real file follows in the same memory.
struct File {
    sqlite3_file base;
};
sqlite3_file* realFile(sqlite3_file* file) {
    return reinterpret_cast<sqlite3_file*>(reinterpret_cast<File*>(file) + 1);
}

template <auto method, int code = SQLITE_OK>
struct Forwarded;
template <class Result, class... Arguments, Result (*sqlite3_io_methods::*method)(sqlite3_file*, Arguments...),
          int code>
struct Forwarded<method, code> {
    static Result call(sqlite3_file* file, Arguments... arguments) {
        if constexpr (code != SQLITE_OK)
            if (fails(code == SQLITE_IOERR_READ ? CallFaults::Kind::Read : CallFaults::Kind::Call)) return code;
        return (realFile(file)->pMethods->*method)(realFile(file), arguments...);
    }
};
template <class Result, class... Arguments, Result (*sqlite3_vfs::*method)(sqlite3_vfs*, Arguments...), int code>
struct Forwarded<method, code> {
    static Result call(sqlite3_vfs*, Arguments... arguments) {
        if (fails(CallFaults::Kind::Call)) return code;
        return (system_->*method)(system_, arguments...);
    }
};

// A lock that could not be given up counts as held from then on, and SQLite waits for it; so giving up does not fail.
int shmLock(sqlite3_file* file, int offset, int count, int flags) {
    if (!(flags & SQLITE_SHM_UNLOCK) && fails(CallFaults::Kind::Call)) return SQLITE_IOERR_SHMLOCK;
    return realFile(file)->pMethods->xShmLock(realFile(file), offset, count, flags);
}

// Neither this nor fsync() below is done for real: no test cuts the power, and it is what takes the time.
int sync(sqlite3_file*, int) {
    return fails(CallFaults::Kind::Call) ? SQLITE_IOERR_FSYNC : SQLITE_OK;
}

using Methods = sqlite3_io_methods;
const Methods methods = {
    .iVersion = 3,
    .xClose = Forwarded<&Methods::xClose>::call,
    .xRead = Forwarded<&Methods::xRead, SQLITE_IOERR_READ>::call,
    .xWrite = Forwarded<&Methods::xWrite, SQLITE_IOERR_WRITE>::call,
    .xTruncate = Forwarded<&Methods::xTruncate, SQLITE_IOERR_TRUNCATE>::call,
    .xSync = sync,
    .xFileSize = Forwarded<&Methods::xFileSize, SQLITE_IOERR_FSTAT>::call,
    .xLock = Forwarded<&Methods::xLock, SQLITE_IOERR_LOCK>::call,
    .xUnlock = Forwarded<&Methods::xUnlock, SQLITE_IOERR_UNLOCK>::call,
    .xCheckReservedLock = Forwarded<&Methods::xCheckReservedLock, SQLITE_IOERR_CHECKRESERVEDLOCK>::call,
    .xFileControl = Forwarded<&Methods::xFileControl>::call,
    .xSectorSize = Forwarded<&Methods::xSectorSize>::call,
    .xDeviceCharacteristics = Forwarded<&Methods::xDeviceCharacteristics>::call,
    .xShmMap = Forwarded<&Methods::xShmMap, SQLITE_IOERR_SHMMAP>::call,
    .xShmLock = shmLock,
    .xShmBarrier = Forwarded<&Methods::xShmBarrier>::call,
    .xShmUnmap = Forwarded<&Methods::xShmUnmap>::call,
    .xFetch = Forwarded<&Methods::xFetch>::call,
    .xUnfetch = Forwarded<&Methods::xUnfetch>::call,
};

int open(sqlite3_vfs*, sqlite3_filename name, sqlite3_file* file, int flags, int* outFlags) {
    file->pMethods = nullptr;
    if (fails(CallFaults::Kind::Call)) return SQLITE_CANTOPEN;
    const int result = system_->xOpen(system_, name, realFile(file), flags, outFlags);
    if (realFile(file)->pMethods) file->pMethods = &methods;
    return result;
}

void* allocate(int size) {
    return fails(CallFaults::Kind::Allocation) ? nullptr : allocator.xMalloc(size);
}

void* reallocate(void* memory, int size) {
    return fails(CallFaults::Kind::Allocation) ? nullptr : allocator.xRealloc(memory, size);
}

}  // namespace

void CallFaults::install() {
    sqlite3_config(SQLITE_CONFIG_GETMALLOC, &allocator);
    static sqlite3_mem_methods failing;
    failing = allocator;
    failing.xMalloc = allocate;
    failing.xRealloc = reallocate;
    sqlite3_config(SQLITE_CONFIG_MALLOC, &failing);

    system_ = sqlite3_vfs_find(nullptr);
    static sqlite3_vfs vfs;
    vfs = *system_;
    vfs.zName = "faults";
    vfs.szOsFile += static_cast<int>(sizeof(File));
    vfs.xOpen = open;
    vfs.xDelete = Forwarded<&sqlite3_vfs::xDelete, SQLITE_IOERR_DELETE>::call;
    vfs.xAccess = Forwarded<&sqlite3_vfs::xAccess, SQLITE_IOERR_ACCESS>::call;
    vfs.xFullPathname = Forwarded<&sqlite3_vfs::xFullPathname, SQLITE_CANTOPEN>::call;
    sqlite3_vfs_register(&vfs, 1);
}

void CallFaults::fail(Kind kind, int number, bool isForGood) {
    plan = {kind, number, isForGood, false};
}

bool CallFaults::end() {
    const bool hasFailed = plan.hasFailed;
    plan = {};
    return hasFailed;
}

}  // namespace vrx

// The linker gives these to whoever calls NAME: see --wrap in tests/CMakeLists.txt.
// clang-format off
#define WRAP(result, name, parameters, arguments)                                                   \
    extern "C" result __real_##name parameters;                                                     \
    extern "C" result __wrap_##name parameters { return vrx::callFails() ? -1 : __real_##name arguments; }
WRAP(int, open, (const char* path, int flags, mode_t mode), (path, flags, mode))
WRAP(int, flock, (int file, int operation), (file, operation))
WRAP(int, ftruncate, (int file, off_t size), (file, size))
WRAP(int, stat, (const char* path, struct stat* status), (path, status))
WRAP(int, fstat, (int file, struct stat* status), (file, status))
WRAP(int, lstat, (const char* path, struct stat* status), (path, status))
WRAP(int, rename, (const char* from, const char* to), (from, to))
WRAP(int, unlink, (const char* path), (path))
WRAP(int, mkdir, (const char* path, mode_t mode), (path, mode))
// clang-format on

extern "C" int __wrap_fsync(int) {
    return vrx::callFails() ? -1 : 0;
}

// Short writes are ordinary.
extern "C" ssize_t __real_write(int file, const void* bytes, std::size_t size);
extern "C" ssize_t __wrap_write(int file, const void* bytes, std::size_t size) {
    return vrx::callFails() ? -1 : __real_write(file, bytes, vrx::isPlanned() ? (size + 1) / 2 : size);
}

extern "C" ssize_t __real_read(int file, void* buffer, std::size_t size);
extern "C" ssize_t __wrap_read(int file, void* buffer, std::size_t size) {
    return vrx::callFails(vrx::CallFaults::Kind::Read) ? -1 : __real_read(file, buffer, size);
}

// Closes the file all the same, as the system does.
extern "C" int __real_close(int file);
extern "C" int __wrap_close(int file) {
    const int result = __real_close(file);
    return vrx::callFails() ? -1 : result;
}
