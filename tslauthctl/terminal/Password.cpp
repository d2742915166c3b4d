// SPDX-License-Identifier: Apache-2.0
#include "terminal/Password.h"

#include "terminal/Console.h"
#include "terminal/EscapedText.h"
#include "terminal/SignalWatch.h"

#include <base/Descriptor.h>
#include <base/FileError.h>

#include <array>
#include <cerrno>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <termios.h>
#include <unistd.h>

namespace tessel::tslauthctl {

namespace {

using base::Descriptor;
using base::SystemText;

constexpr char terminalPath[] = "/dev/tty";

/// What has been read so far, up to its first line feed.
class FirstLine {
public:
    explicit FirstLine(Secret& secret) : _secret(secret), _length(0) {
        _secret.Wipe();
    }

    /// Reads once. One byte at a time would leave the rest of a pipe to others, but a password's
    /// source is used up.
    /// @return whether there is more to read
    /// @throws Failure
    bool Read(int descriptor, std::string const& name) {
        std::size_t const room = Secret::Capacity - 1 - _length;
        ssize_t const count = read(descriptor, _secret.Memory() + _length, room);
        if (count < 0) {
            if (int const error = errno; error != EINTR && error != EAGAIN) {
                _secret.Wipe();
                throw Failure(ExitCode::failure,
                              "Cannot read the password from " + name + ": " + SystemText(error));
            }
            return true;
        }
        char* const begin = _secret.Memory() + _length;
        auto const* const end =
            static_cast<char*>(std::memchr(begin, '\n', static_cast<std::size_t>(count)));
        _length += static_cast<std::size_t>(end == nullptr ? count : end - begin);
        return count > 0 && end == nullptr && _length < Secret::Capacity - 1;
    }

    /// Leaves the secret as a text.
    /// @throws Failure
    void Finish(std::string const& name) {
        char* const memory = _secret.Memory();
        if (_length > 0 && memory[_length - 1] == '\r') {
            --_length;
        }
        bool const hasZero = std::memchr(memory, '\0', _length) != nullptr;
        if (hasZero || _length > Secret::MaxLength) {
            _secret.Wipe();
            throw Failure(
                ExitCode::usage,
                "The password from " + name +
                    (hasZero ? " holds a zero byte"
                             : " is longer than " + std::to_string(Secret::MaxLength) + " bytes"));
        }
        explicit_bzero(memory + _length, Secret::Capacity - _length);
    }

private:
    Secret& _secret;
    std::size_t _length;
};

void ReadFrom(int descriptor, std::string const& name, Secret& secret) {
    if (isatty(descriptor) == 1) {
        throw Failure(ExitCode::usage, "The password would be seen: " + name +
                                           " is a terminal; leave the option out to be asked");
    }
    FirstLine line(secret);
    while (line.Read(descriptor, name)) {
        // A descriptor that does not block is waited for.
        pollfd waiting = {descriptor, POLLIN, 0};
        (void)poll(&waiting, 1, -1); // if it fails, reading tells why
    }
    line.Finish(name);
}

void ReadFromFile(std::string const& path, Secret& secret) {
    auto const refuse = [&](std::string const& reason) {
        throw Failure(ExitCode::usage, "The password is not read from '" + path + "': " + reason);
    };
    // Neither a link, which leads to what somebody else chose, nor a pipe that never comes.
    Descriptor const file(
        open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC));
    if (file.Get() < 0) {
        int const error = errno;
        refuse(error == ELOOP ? "it is a link" : SystemText(error));
    }
    struct stat status = {};
    if (fstat(file.Get(), &status) != 0) {
        refuse(SystemText(errno));
    }
    if (!S_ISREG(status.st_mode)) {
        refuse("it is not a regular file");
    }
    if (status.st_uid != geteuid() && status.st_uid != 0) {
        refuse("it belongs to another user");
    }
    if ((status.st_mode & (S_IRWXG | S_IRWXO)) != 0) {
        refuse("others may use it; make it readable for its owner alone (chmod 600)");
    }
    ReadFrom(file.Get(), "'" + path + "'", secret);
}

void ReadFromDescriptor(int descriptor, std::string const& name, Secret& secret) {
    int const flags = fcntl(descriptor, F_GETFL);
    if (flags < 0 || (flags & O_ACCMODE) == O_WRONLY) {
        throw Failure(ExitCode::usage, "The password cannot be read from " + name + ": " +
                                           SystemText(flags < 0 ? errno : EBADF));
    }
    ReadFrom(descriptor, name, secret);
}

/// The terminal without its echo, as long as one exists.
class SilentTerminal {
public:
    SilentTerminal(int descriptor, std::string const& prompt) : _descriptor(descriptor), _before() {
        if (tcgetattr(_descriptor, &_before) != 0) {
            Fail();
        }
        termios silent = _before;
        silent.c_lflag &= ~static_cast<tcflag_t>(ECHO | ECHOE | ECHOK | ECHONL);
        // A line at a time, so that nothing is handed over before it is complete.
        silent.c_lflag |= static_cast<tcflag_t>(ICANON | ISIG);
        // What was typed before the echo went is not part of a password.
        Set(silent);
        Write(prompt);
    }
    SilentTerminal(SilentTerminal const&) = delete;
    SilentTerminal& operator=(SilentTerminal const&) = delete;
    ~SilentTerminal() {
        Write("\n");
        // Half a password, typed before a signal came, is not left to the shell.
        try {
            Set(_before);
        } catch (Failure const&) {
            // The terminal is gone.
        }
    }

private:
    /// Also where the process has been put into the background meanwhile.
    void Set(termios const& attributes) const {
        sigset_t stop;
        sigset_t before;
        sigemptyset(&stop);
        sigaddset(&stop, SIGTTOU);
        // Neither can fail for such a set; with it, the next call is allowed in the background.
        (void)pthread_sigmask(SIG_BLOCK, &stop, &before);
        int result = 0;
        do {
            result = tcsetattr(_descriptor, TCSAFLUSH, &attributes);
        } while (result != 0 && errno == EINTR);
        int const error = errno;
        (void)pthread_sigmask(SIG_SETMASK, &before, nullptr);
        errno = error;
        if (result != 0) {
            Fail();
        }
    }

    [[noreturn]] static void Fail() {
        throw Failure(ExitCode::failure,
                      "Cannot turn off the terminal's echo: " + SystemText(errno));
    }

    void Write(std::string const& text) const {
        // Without the prompt it still works; a terminal that is gone is noticed when it is read.
        ssize_t const written = write(_descriptor, text.data(), text.size());
        (void)written; // see above
    }

    int _descriptor;
    termios _before;
};

void ReadLine(int terminal, SignalWatch const& watch, Secret& secret) {
    FirstLine line(secret);
    for (bool more = true; more;) {
        std::array<pollfd, 2> waiting = {{{terminal, POLLIN, 0}, {watch.Descriptor(), POLLIN, 0}}};
        if (poll(waiting.data(), waiting.size(), -1) < 0 && errno != EINTR) {
            throw Failure(ExitCode::failure, "Cannot wait for the password: " + SystemText(errno));
        }
        if (watch.Signal() != 0) {
            return;
        }
        if (waiting[0].revents != 0) {
            more = line.Read(terminal, "the terminal");
        }
    }
    line.Finish("the terminal");
}

/// Asks once.
/// @return 0, or the signal that came before the password did
int AskOnce(int terminal, std::string const& prompt, Secret& secret) {
    SignalWatch watch(SignalWatch::Signals::all);
    {
        SilentTerminal const silent(terminal, prompt);
        ReadLine(terminal, watch, secret);
    }
    int const signal = watch.Stop();
    if (signal != 0) {
        secret.Wipe();
    }
    return signal;
}

void ReadFromTerminal(std::string const& prompt, Secret& secret) {
    Descriptor const terminal(open(terminalPath, O_RDWR | O_NOCTTY | O_CLOEXEC));
    if (terminal.Get() < 0) {
        throw Failure(ExitCode::usage,
                      "There is no terminal to ask for the password; use --password-stdin, "
                      "--password-file or --password-fd");
    }
    for (;;) {
        // In the background the terminal is somebody else's, and its echo is not ours to turn off.
        if (tcgetpgrp(terminal.Get()) != getpgrp()) {
            // Stops here; afterwards it is looked at again. Where nobody can continue the process
            // the signal does nothing.
            (void)raise(SIGTTIN);
            if (tcgetpgrp(terminal.Get()) != getpgrp()) {
                throw Failure(ExitCode::usage, "The password cannot be asked for in the "
                                               "background");
            }
        }
        int const signal = AskOnce(terminal.Get(), prompt, secret);
        if (signal == 0) {
            return;
        }
        // Now with the effect that it would have had. After a stop, or where it was one that
        // continues, the question comes again.
        (void)raise(signal);
    }
}

} // namespace

void ProtectMemory() {
    rlimit const none = {0, 0};
    if (setrlimit(RLIMIT_CORE, &none) != 0 || prctl(PR_SET_DUMPABLE, 0, 0, 0, 0) != 0) {
        throw Failure(ExitCode::failure,
                      "Cannot turn off core files, so no password is read: " + SystemText(errno));
    }
}

void ReadPassword(PasswordSource const& source, std::string const& prompt, Secret& secret) {
    if (source.standardInput) {
        ReadFromDescriptor(STDIN_FILENO, "the standard input", secret);
    } else if (!source.file.empty()) {
        ReadFromFile(source.file, secret);
    } else if (source.descriptor >= 0) {
        ReadFromDescriptor(source.descriptor, "descriptor " + std::to_string(source.descriptor),
                           secret);
    } else {
        ReadFromTerminal(Escaped(prompt), secret);
    }
}

} // namespace tessel::tslauthctl
