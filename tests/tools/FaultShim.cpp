/* Preloaded into ovrameta by the write fault tests: makes one system call
 * on one file fail, or stops the process there, the way a failing disk, a
 * full file system or a user's Ctrl-C would.
 *
 *   OVRA_FAULT="CALL:WHAT:N:TEXT"  the N-th CALL on a file whose path holds
 *       TEXT (for open and create: the N-th such open; every one when N is 0)
 *       fails with errno WHAT
 *       (EIO, EACCES, EMFILE, ENOSPC, EROFS), or the process gets signal
 *       WHAT (KILL, TERM) just before it. CALL is open, create (an open that
 *       makes a file), read, pread, lseek, write, copy_file_range, fsync or
 *       rename; for rename, WHAT may be MOVE: the file named TEXT is moved
 *       away and a folder takes its name just before the rename.
 *   OVRA_FAULT_NO_TMPFILE=1  unnamed new files are not supported.
 *   OVRA_FAULT_FIRED=PATH     a line is appended to PATH when the fault fires.
 */
#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdarg.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/stat.h>
#include <sys/types.h>
#include <unistd.h>

namespace {

#define MAX_FDS 4096

static char sCall[32], sWhat[16], sText[1024];
static int sNth, sCount, sFired, sParsed;
static unsigned char sTracked[MAX_FDS];

static void Parse(void) {
  if (sParsed) return;
  sParsed = 1;
  const char* spec = getenv("OVRA_FAULT");
  if (!spec) return;
  if (sscanf(spec, "%31[^:]:%15[^:]:%d:%1023[^\n]", sCall, sWhat, &sNth, sText) != 4) sCall[0] = 0;
}

static void Fire(void) {
  sFired = 1;
  const char* report = getenv("OVRA_FAULT_FIRED");
  if (report) {
    FILE* f = fopen(report, "a");
    if (f) {
      fprintf(f, "%s %s %d\n", sCall, sWhat, sNth);
      fclose(f);
    }
  }
}

/* Whether this call is the one to fail; sets errno or sends the signal. */
static int Hit(const char* call, int tracked) {
  Parse();
  if ((sFired && sNth != 0) || !tracked || strcmp(call, sCall) != 0 || (sNth != 0 && ++sCount != sNth)) return 0;
  Fire();
  if (strcmp(sWhat, "KILL") == 0) raise(SIGKILL);
  if (strcmp(sWhat, "TERM") == 0) {
    raise(SIGTERM);
    return 0;
  }
  if (strcmp(sWhat, "MOVE") == 0) return 1;
  errno = strcmp(sWhat, "EIO") == 0      ? EIO
          : strcmp(sWhat, "EACCES") == 0 ? EACCES
          : strcmp(sWhat, "EMFILE") == 0 ? EMFILE
          : strcmp(sWhat, "ENOSPC") == 0 ? ENOSPC
          : strcmp(sWhat, "EROFS") == 0  ? EROFS
                                         : EIO;
  return 1;
}

static int Named(const char* path) {
  Parse();
  return path && sText[0] && strstr(path, sText) != NULL;
}
static int Tracked(int fd) { return fd >= 0 && fd < MAX_FDS && sTracked[fd]; }
static void Track(int fd, const char* path) {
  if (fd >= 0 && fd < MAX_FDS) sTracked[fd] = static_cast<unsigned char>(Named(path));
}

// The function the preload stands in for.
#define REAL(name) static const auto real_##name = reinterpret_cast<decltype(&::name)>(dlsym(RTLD_NEXT, #name))

static int OpenCommon(int dirfd, const char* path, int flags, mode_t mode, int at) {
  REAL(open);
  REAL(openat);
  const int creating = (flags & O_CREAT) || (flags & __O_TMPFILE) == __O_TMPFILE;
  if (Named(path) && Hit(creating ? "create" : "open", 1)) return -1;
  if ((flags & __O_TMPFILE) == __O_TMPFILE && getenv("OVRA_FAULT_NO_TMPFILE")) {
    errno = EOPNOTSUPP;
    return -1;
  }
  const int fd = at ? real_openat(dirfd, path, flags, mode) : real_open(path, flags, mode);
  Track(fd, path);
  return fd;
}

}  // namespace

extern "C" {

// The mode argument an open that makes a file carries.
#define MODE_OF(flags)                                       \
  mode_t mode = 0;                                           \
  if ((flags) & (O_CREAT | __O_TMPFILE)) {                   \
    va_list args;                                            \
    va_start(args, flags);                                   \
    mode = static_cast<mode_t>(va_arg(args, int));           \
    va_end(args);                                            \
  }

int open(const char* path, int flags, ...) {
  MODE_OF(flags)
  return OpenCommon(AT_FDCWD, path, flags, mode, 0);
}
int open64(const char* path, int flags, ...) {
  MODE_OF(flags)
  return OpenCommon(AT_FDCWD, path, flags, mode, 0);
}
int openat(int dirfd, const char* path, int flags, ...) {
  MODE_OF(flags)
  return OpenCommon(dirfd, path, flags, mode, 1);
}

ssize_t read(int fd, void* buffer, size_t count) {
  REAL(read);
  if (Hit("read", Tracked(fd))) return -1;
  return real_read(fd, buffer, count);
}
ssize_t pread(int fd, void* buffer, size_t count, off_t offset) {
  REAL(pread);
  if (Hit("pread", Tracked(fd))) return -1;
  return real_pread(fd, buffer, count, offset);
}
ssize_t pread64(int fd, void* buffer, size_t count, off64_t offset) {
  REAL(pread64);
  if (Hit("pread", Tracked(fd))) return -1;
  return real_pread64(fd, buffer, count, offset);
}
off_t lseek(int fd, off_t offset, int whence) {
  REAL(lseek);
  if (Hit("lseek", Tracked(fd))) return -1;
  return real_lseek(fd, offset, whence);
}
off64_t lseek64(int fd, off64_t offset, int whence) {
  REAL(lseek64);
  if (Hit("lseek", Tracked(fd))) return -1;
  return real_lseek64(fd, offset, whence);
}
ssize_t write(int fd, const void* buffer, size_t count) {
  REAL(write);
  if (Hit("write", Tracked(fd))) return -1;
  return real_write(fd, buffer, count);
}
ssize_t copy_file_range(int in, loff_t* inOffset, int out, loff_t* outOffset, size_t length, unsigned flags) {
  REAL(copy_file_range);
  if (Hit("copy_file_range", Tracked(in) || Tracked(out))) return -1;
  return real_copy_file_range(in, inOffset, out, outOffset, length, flags);
}
int fsync(int fd) {
  REAL(fsync);
  if (Hit("fsync", Tracked(fd))) return -1;
  return real_fsync(fd);
}
int close(int fd) {
  REAL(close);
  if (fd >= 0 && fd < MAX_FDS) sTracked[fd] = 0;
  return real_close(fd);
}
int rename(const char* from, const char* to) {
  REAL(rename);
  if (Hit("rename", Named(to))) {
    if (strcmp(sWhat, "MOVE") != 0) return -1;
    char moved[4200];
    snprintf(moved, sizeof moved, "%s.moved", to);
    real_rename(to, moved);
    mkdir(to, 0755);
  }
  return real_rename(from, to);
}

}  // extern "C"
