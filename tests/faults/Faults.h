// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_FAULTS_FAULTS_H
#define TESTS_FAULTS_FAULTS_H

#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <cxxabi.h>
#include <dlfcn.h>
#include <exception>
#include <functional>
#include <gnu/libc-version.h>
#include <linux/audit.h>
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <poll.h>
#include <stdexcept>
#include <string>
#include <sys/ioctl.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <typeinfo>
#include <unistd.h>
#include <utility>
#include <vector>

/// Faults at the system-call line.
///
/// An operation runs in a child process whose file-system calls the kernel holds until this process
/// has decided what becomes of each: it happens, it fails with an error number, or the child is
/// killed just before it. No library in between is replaced, so it makes no difference who makes a
/// call, by which of its variants, and whether the process has 32 or 64 bits. Needs no privileges,
/// but a kernel with seccomp notifications (Linux 5.5).
namespace faults {

/// What becomes of one call.
struct Decision {
    enum class Kind { happens, fails, killed };
    Kind kind;
    int error;
};

inline Decision Happens() {
    return {Decision::Kind::happens, 0};
}
inline Decision FailsWith(int error) {
    return {Decision::Kind::fails, error};
}
inline Decision Killed() {
    return {Decision::Kind::killed, 0};
}

/// What became of the operation.
struct Outcome {
    bool finished = false; ///< it returned or threw; otherwise its process died
    std::string exception; ///< the class that it threw, as in "tessel::authentication::IOError"
    std::string message;   ///< and what that said
    std::vector<std::string> calls; ///< the calls it made, by the names in `Calls`
    bool injected = false;          ///< some call failed or killed
};

/// The watched calls. Variants of one call share a name.
inline std::vector<std::pair<int, char const*>> const& Calls() {
    static std::vector<std::pair<int, char const*>> const calls = {
#ifdef __NR_open
        {__NR_open, "open"},
#endif
        {__NR_openat, "open"},
        {__NR_read, "read"},
        {__NR_write, "write"},
        {__NR_writev, "write"},
        {__NR_fsync, "fsync"},
        {__NR_fdatasync, "fsync"},
        {__NR_ftruncate, "ftruncate"},
#ifdef __NR_stat
        {__NR_stat, "stat"},
        {__NR_fstat, "stat"},
#endif
#ifdef __NR_stat64
        {__NR_stat64, "stat"},
        {__NR_fstat64, "stat"},
        {__NR_fstatat64, "stat"},
#endif
#ifdef __NR_newfstatat
        {__NR_newfstatat, "stat"},
#endif
        {__NR_statx, "stat"},
#ifdef __NR_chmod
        {__NR_chmod, "chmod"},
#endif
        {__NR_fchmod, "chmod"},
        {__NR_fchmodat, "chmod"},
        {__NR_fchown, "chown"},
        {__NR_fchownat, "chown"},
#ifdef __NR_chown
        {__NR_chown, "chown"},
        {__NR_lchown, "chown"},
#endif
#ifdef __NR_fchown32
        {__NR_fchown32, "chown"},
#endif
        {__NR_flistxattr, "listxattr"},
        {__NR_fgetxattr, "getxattr"},
        {__NR_fsetxattr, "setxattr"},
        {__NR_fremovexattr, "removexattr"},
#ifdef __NR_rename
        {__NR_rename, "rename"},
#endif
#ifdef __NR_renameat
        {__NR_renameat, "rename"},
#endif
        {__NR_renameat2, "rename"},
#ifdef __NR_unlink
        {__NR_unlink, "unlink"},
#endif
        {__NR_unlinkat, "unlink"},
#ifdef __NR_link
        {__NR_link, "link"},
#endif
        {__NR_linkat, "link"},
#ifdef __NR_symlink
        {__NR_symlink, "symlink"},
#endif
        {__NR_symlinkat, "symlink"},
#ifdef __NR_mkdir
        {__NR_mkdir, "mkdir"},
#endif
        {__NR_mkdirat, "mkdir"},
#ifdef __NR_rmdir
        {__NR_rmdir, "rmdir"},
#endif
        {__NR_close, "close"},
    };
    return calls;
}

namespace detail {

/// Where the child leaves how it ended. `write` is watched, shared memory is not.
struct Report {
    bool finished;
    char exception[256];
    char message[16384];
};

/// A child ends with this if the kernel or the surroundings do not let it be watched.
constexpr int cannotBeWatched = 120;

inline int InstallFilter() {
    std::vector<sock_filter> program;
    program.push_back(BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr)));
    for (auto const& call : Calls()) {
        program.push_back(
            BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, static_cast<unsigned>(call.first), 0, 1));
        program.push_back(BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_USER_NOTIF));
    }
    program.push_back(BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW));
    sock_fprog const filter = {static_cast<unsigned short>(program.size()), program.data()};
    if (::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0) != 0) {
        return -1;
    }
    return static_cast<int>(
        ::syscall(SYS_seccomp, SECCOMP_SET_MODE_FILTER, SECCOMP_FILTER_FLAG_NEW_LISTENER, &filter));
}

union Ancillary {
    cmsghdr header;
    char bytes[CMSG_SPACE(sizeof(int))];
};

inline bool SendDescriptor(int socket, int descriptor) {
    char byte = 0;
    iovec data = {&byte, 1};
    Ancillary ancillary = {};
    msghdr message = {};
    message.msg_iov = &data;
    message.msg_iovlen = 1;
    message.msg_control = ancillary.bytes;
    message.msg_controllen = sizeof ancillary.bytes;
    ancillary.header.cmsg_level = SOL_SOCKET;
    ancillary.header.cmsg_type = SCM_RIGHTS;
    ancillary.header.cmsg_len = CMSG_LEN(sizeof descriptor);
    std::memcpy(CMSG_DATA(&ancillary.header), &descriptor, sizeof descriptor);
    return ::sendmsg(socket, &message, 0) == 1;
}

/// -1 if the child ended before it sent one.
inline int ReceiveDescriptor(int socket) {
    char byte = 0;
    iovec data = {&byte, 1};
    Ancillary ancillary = {};
    msghdr message = {};
    message.msg_iov = &data;
    message.msg_iovlen = 1;
    message.msg_control = ancillary.bytes;
    message.msg_controllen = sizeof ancillary.bytes;
    int descriptor = -1;
    if (::recvmsg(socket, &message, 0) == 1) {
        std::memcpy(&descriptor, CMSG_DATA(&ancillary.header), sizeof descriptor);
    }
    return descriptor;
}

inline void Copy(char* to, std::size_t size, std::string const& text) {
    to[text.copy(to, size - 1)] = '\0';
}

[[noreturn]] inline void RunChild(std::function<void()> const& operation, int socket,
                                  Report& report) {
    int const listener = InstallFilter();
    if (listener < 0 || !SendDescriptor(socket, listener)) {
        ::_exit(cannotBeWatched);
    }
    try {
        operation();
    } catch (std::exception const& exception) {
        int status = 0;
        char* const name = abi::__cxa_demangle(typeid(exception).name(), nullptr, nullptr, &status);
        Copy(report.exception, sizeof report.exception, status == 0 ? name : "?");
        std::free(name);
        Copy(report.message, sizeof report.message, exception.what());
    }
    report.finished = true;
    ::_exit(0);
}

inline char const* NameOf(int number) {
    for (auto const& call : Calls()) {
        if (call.first == number) {
            return call.second;
        }
    }
    return "?";
}

/// Whether the instruction that entered the kernel is the C library's, or that of the page that the
/// kernel gives 32-bit processes for it. Otherwise the call is one that a sanitizer's runtime makes
/// for itself, past the C library. The child has this process's addresses.
inline bool IsOfTheCLibrary(std::uint64_t instruction) {
    auto const objectOf = [](void const* address) {
        Dl_info info = {};
        return ::dladdr(address, &info) != 0 ? std::string(info.dli_fname) : std::string();
    };
    auto const address = static_cast<std::uintptr_t>(instruction);
    // A function that no sanitizer puts one of its own in front of.
    std::string const library = objectOf(reinterpret_cast<void const*>(&::gnu_get_libc_version));
    std::string const object = objectOf(reinterpret_cast<void const*>(address));
    return object == library || object.find("linux-gate") != std::string::npos;
}

/// Answers the child's calls until it is gone.
inline void Supervise(int listener, pid_t child,
                      std::function<Decision(std::size_t, std::string const&)> const& decide,
                      Outcome& outcome) {
    for (;;) {
        pollfd waiting = {listener, POLLIN, 0};
        if (::poll(&waiting, 1, -1) < 0 && errno == EINTR) {
            continue;
        }
        if (!(waiting.revents & POLLIN)) {
            return;
        }
        seccomp_notif call = {};
        if (::ioctl(listener, SECCOMP_IOCTL_NOTIF_RECV, &call) != 0) {
            continue;
        }
        Decision decision = Happens();
        if (IsOfTheCLibrary(call.data.instruction_pointer)) {
            outcome.calls.emplace_back(NameOf(call.data.nr));
            decision = decide(outcome.calls.size(), outcome.calls.back());
        }
        seccomp_notif_resp answer = {};
        answer.id = call.id;
        switch (decision.kind) {
        case Decision::Kind::happens:
            answer.flags = SECCOMP_USER_NOTIF_FLAG_CONTINUE;
            break;
        case Decision::Kind::fails:
            outcome.injected = true;
            answer.error = -decision.error;
            break;
        case Decision::Kind::killed:
            outcome.injected = true;
            ::kill(child, SIGKILL);
            continue;
        }
        // It fails only when the child is gone, which the next round finds out.
        (void)::ioctl(listener, SECCOMP_IOCTL_NOTIF_SEND, &answer);
    }
}

} // namespace detail

/// Runs `operation` in a child process; `decide` is asked before each of its calls, with the call's
/// place (from 1) and its name.
/// @throws std::runtime_error if this kernel does not let a process be watched
inline Outcome Run(std::function<void()> const& operation,
                   std::function<Decision(std::size_t, std::string const&)> const& decide) {
    int sockets[2];
    void* const memory = ::mmap(nullptr, sizeof(detail::Report), PROT_READ | PROT_WRITE,
                                MAP_SHARED | MAP_ANONYMOUS, -1, 0);
    if (memory == MAP_FAILED || ::socketpair(AF_UNIX, SOCK_STREAM, 0, sockets) != 0) {
        throw std::runtime_error("no memory or no socket for a child");
    }
    auto& report = *static_cast<detail::Report*>(memory);
    pid_t const child = ::fork();
    if (child < 0) {
        throw std::runtime_error("no child process");
    }
    if (child == 0) {
        detail::RunChild(operation, sockets[1], report);
    }
    ::close(sockets[1]);
    Outcome outcome;
    int const listener = detail::ReceiveDescriptor(sockets[0]);
    ::close(sockets[0]);
    if (listener >= 0) {
        detail::Supervise(listener, child, decide, outcome);
        ::close(listener);
    }
    int status = 0;
    while (::waitpid(child, &status, 0) < 0 && errno == EINTR) {
    }
    outcome.finished = report.finished;
    outcome.exception = report.exception;
    outcome.message = report.message;
    ::munmap(memory, sizeof(detail::Report));
    if (WIFEXITED(status) && WEXITSTATUS(status) == detail::cannotBeWatched) {
        throw std::runtime_error("this kernel has no seccomp notifications");
    }
    return outcome;
}

/// Lets all happen but the call at `place`, counted from 1.
inline Outcome RunWithFaultAt(std::size_t place, Decision fault,
                              std::function<void()> const& operation) {
    return Run(operation, [&](std::size_t current, std::string const&) {
        return current == place ? fault : Happens();
    });
}

/// Lets all happen but the calls of one name from the `first` of them on, `count` of them.
inline Outcome RunWithFaultIn(std::string const& name, Decision fault,
                              std::function<void()> const& operation, std::size_t first = 1,
                              std::size_t count = static_cast<std::size_t>(-1)) {
    std::size_t seen = 0;
    return Run(operation, [&](std::size_t, std::string const& current) {
        if (current != name || ++seen < first || seen - first >= count) {
            return Happens();
        }
        return fault;
    });
}

/// True if this kernel lets a process be watched; otherwise the tests with faults are skipped.
inline bool Available() {
    try {
        return Run([] {}, [](std::size_t, std::string const&) { return Happens(); }).finished;
    } catch (std::runtime_error const&) {
        return false;
    }
}

/// Runs `operation` again and again, with `fault` at its first call, its second, and so on, until
/// it makes no call that has not had its turn. `check` sees each outcome, and `prepare` puts
/// everything back before it.
/// @return how many calls had the fault
inline std::size_t Walk(Decision fault, std::function<void()> const& prepare,
                        std::function<void()> const& operation,
                        std::function<void(std::size_t, Outcome const&)> const& check) {
    for (std::size_t place = 1;; ++place) {
        prepare();
        Outcome const outcome = RunWithFaultAt(place, fault, operation);
        if (!outcome.injected) {
            return place - 1;
        }
        check(place, outcome);
    }
}

} // namespace faults

#endif
