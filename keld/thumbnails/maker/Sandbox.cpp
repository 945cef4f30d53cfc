#include "keld/thumbnails/maker/Sandbox.h"

#include <cerrno>
#include <fcntl.h>
#include <initializer_list>
#include <linux/landlock.h>
#include <linux/seccomp.h>
#include <memory>
#include <sched.h>
#include <seccomp.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/syscall.h>
#include <unistd.h>

namespace droxa::keld {

namespace {

// Where libraries find fonts and the tables of character sets.
constexpr const char *kReadableFolders[] = {
    "/usr/share",      "/usr/lib", "/usr/lib64", "/lib", "/etc/fonts", "/var/cache/fontconfig",
    "/etc/ld.so.cache"};

constexpr std::uint64_t kAllFileRights = (LANDLOCK_ACCESS_FS_MAKE_SYM << 1) - 1;  // of the first version

// What memory, threads, descriptors and clocks need. Nothing that makes a process, a socket or a file.
constexpr const char *kAllowed[] = {"read",
                                    "readv",
                                    "pread64",
                                    "preadv",
                                    "write",
                                    "writev",
                                    "lseek",
                                    "close",
                                    "fstat",
                                    "fcntl",
                                    "dup",
                                    "poll",
                                    "ppoll",
                                    "brk",
                                    "mmap",
                                    "munmap",
                                    "mprotect",
                                    "mremap",
                                    "madvise",
                                    "futex",
                                    "futex_waitv",
                                    "set_robust_list",
                                    "rseq",
                                    "set_tid_address",
                                    "sched_yield",
                                    "gettid",
                                    "getpid",
                                    "getuid",
                                    "geteuid",
                                    "getgid",
                                    "getegid",
                                    "clock_gettime",
                                    "clock_getres",
                                    "clock_nanosleep",
                                    "nanosleep",
                                    "gettimeofday",
                                    "time",
                                    "getrandom",
                                    "rt_sigaction",
                                    "rt_sigprocmask",
                                    "rt_sigreturn",
                                    "sigaltstack",
                                    "sched_getaffinity",
                                    "sysinfo",
                                    "uname",
                                    "getrusage",
                                    "restart_syscall",
                                    "exit",
                                    "exit_group",
                                    "eventfd2",
                                    "getcpu",
                                    "membarrier",
                                    "fadvise64"};

// Looking at files; opening them is for the rules on files to judge.
constexpr const char *kFileCalls[] = {"newfstatat", "stat",       "lstat",    "statx",      "access",
                                      "faccessat",  "faccessat2", "readlink", "readlinkat", "statfs",
                                      "fstatfs",    "getdents64", "getcwd"};

constexpr std::uint64_t kWritingFlags = O_ACCMODE | O_CREAT | O_TRUNC | (O_TMPFILE & ~O_DIRECTORY);

using Filter = std::unique_ptr<void, decltype(&seccomp_release)>;

int addRule(scmp_filter_ctx filter, std::uint32_t action, const char *name,
            std::initializer_list<scmp_arg_cmp> arguments = {}) {
  const int call = seccomp_syscall_resolve_name(name);
  if (call == __NR_SCMP_ERROR) return 0;  // not on this machine
  return seccomp_rule_add_array(filter, action, call, static_cast<unsigned>(arguments.size()),
                                arguments.begin());
}

scmp_arg_cmp hasBits(unsigned argument, std::uint64_t mask, std::uint64_t bits) {
  return {argument, SCMP_CMP_MASKED_EQ, mask, bits};
}

bool addRules(scmp_filter_ctx filter, bool mayOpen) {
  int problem = 0;
  for (const char *name : kAllowed) problem |= addRule(filter, SCMP_ACT_ALLOW, name);
  // Threads; the newer call, whose arguments can't be looked at, is said not to exist.
  problem |= addRule(filter, SCMP_ACT_ALLOW, "clone", {hasBits(0, CLONE_THREAD, CLONE_THREAD)});
  problem |= addRule(filter, SCMP_ACT_ERRNO(ENOSYS), "clone3");
  // Names of threads, and limits to be read.
  problem |= addRule(filter, SCMP_ACT_ALLOW, "prctl", {{0, SCMP_CMP_EQ, PR_SET_NAME, 0}});
  problem |= addRule(filter, SCMP_ACT_ALLOW, "prlimit64", {{2, SCMP_CMP_EQ, 0, 0}});
  if (!mayOpen) return problem == 0;
  for (const char *name : kFileCalls) problem |= addRule(filter, SCMP_ACT_ALLOW, name);
  problem |= addRule(filter, SCMP_ACT_ALLOW, "openat", {hasBits(2, kWritingFlags, 0)});
  problem |= addRule(filter, SCMP_ACT_ALLOW, "open", {hasBits(1, kWritingFlags, 0)});
  return problem == 0;
}

bool setLimit(__rlimit_resource resource, rlim_t value) {
  const rlimit limit{value, value};
  return ::setrlimit(resource, &limit) == 0;
}

}  // namespace

Sandbox::Sandbox() {
  makeFileRules();
  makeFilter();
}

Sandbox::~Sandbox() {
  if (fileRules_ >= 0) ::close(fileRules_);
}

void Sandbox::makeFileRules() {
  landlock_ruleset_attr attributes{};
  attributes.handled_access_fs = kAllFileRights;
  fileRules_ = static_cast<int>(::syscall(SYS_landlock_create_ruleset, &attributes, sizeof attributes, 0));
  if (fileRules_ < 0) return;
  for (const char *path : kReadableFolders) {
    landlock_path_beneath_attr rule{};
    rule.allowed_access = LANDLOCK_ACCESS_FS_READ_FILE;
    rule.parent_fd = ::open(path, O_PATH | O_CLOEXEC | O_DIRECTORY);
    if (rule.parent_fd >= 0)
      rule.allowed_access |= LANDLOCK_ACCESS_FS_READ_DIR;
    else
      rule.parent_fd = ::open(path, O_PATH | O_CLOEXEC);
    if (rule.parent_fd < 0) continue;
    ::syscall(SYS_landlock_add_rule, fileRules_, LANDLOCK_RULE_PATH_BENEATH, &rule, 0);
    ::close(rule.parent_fd);
  }
  protections_ |= kMakerFiles;
}

void Sandbox::makeFilter() {
  const Filter filter(seccomp_init(SCMP_ACT_ERRNO(EPERM)), &seccomp_release);
  if (!filter || !addRules(filter.get(), (protections_ & kMakerFiles) != 0)) return;
  const int memory = ::memfd_create("filter", MFD_CLOEXEC);
  if (memory < 0) return;
  if (seccomp_export_bpf(filter.get(), memory) == 0) {
    const off_t size = ::lseek(memory, 0, SEEK_END);
    filter_.resize(static_cast<std::size_t>(size) / sizeof(sock_filter));
    if (::pread(memory, filter_.data(), static_cast<std::size_t>(size), 0) != size) filter_.clear();
  }
  ::close(memory);
  // A kernel without filters says so for a null one, too.
  const bool isKnown = ::prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, nullptr, 0, 0) != 0 && errno == EFAULT;
  if (!filter_.empty() && isKnown) protections_ |= kMakerSystemCalls;
}

bool Sandbox::applyLimits(const MakerLimits &limits) {
  // The first signal of the two says that it was this limit; the second can't be ignored.
  const rlimit processor{limits.cpuSeconds, limits.cpuSeconds + 1};
  return setLimit(RLIMIT_CORE, 0) && ::setrlimit(RLIMIT_CPU, &processor) == 0 &&
         setLimit(RLIMIT_AS, limits.memoryBytes) && setLimit(RLIMIT_NOFILE, 256) &&
         ::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) == 0;
}

bool Sandbox::confine() const {
  if (!setLimit(RLIMIT_FSIZE, 0) || !setLimit(RLIMIT_NOFILE, 64)) return false;
  if (::prctl(PR_SET_DUMPABLE, 0, 0, 0, 0) != 0) return false;
  if (fileRules_ >= 0 && ::syscall(SYS_landlock_restrict_self, fileRules_, 0) != 0) return false;
  if ((protections_ & kMakerSystemCalls) == 0) return true;
  sock_fprog program{static_cast<unsigned short>(filter_.size()), const_cast<sock_filter *>(filter_.data())};
  return ::prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &program, 0, 0) == 0;
}

}  // namespace droxa::keld
