// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "../../TemporaryFolder.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <mutex>
#include <poll.h>
#include <string>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <thread>
#include <unistd.h>
#include <vector>

extern "C" { // it does not say so itself
#include <wbclient.h>
}

/// libwbclient takes the socket's folder from the environment in a program that exports the first
/// of these, and a folder that is not root's in one that exports the second: the wrappers of
/// Samba's own tests do.
extern "C" __attribute__((visibility("default"))) bool nss_wrapper_enabled(); // NOLINT: its name
extern "C" __attribute__((visibility("default"))) bool uid_wrapper_enabled(); // NOLINT: its name

/// A winbindd that answers as it is told, for this program's libwbclient.
class FakeWinbindd {
public:
    /// What becomes of a request: `Silence` leaves it, and its connection, alone; otherwise these
    /// bytes are sent. Nothing closes the connection.
    typedef std::function<std::string(std::uint32_t command)> Script;

    // The protocol is nobody's but Samba's, whose numbers change with it.
#if WBCLIENT_MINOR_VERSION >= 16
    enum Command : std::uint32_t { InterfaceVersion = 0, PrivilegedFolder = 43 };
    static constexpr std::uint32_t Protocol = 33;
#else
    enum Command : std::uint32_t { InterfaceVersion = 0, PrivilegedFolder = 44 };
    static constexpr std::uint32_t Protocol = 32;
#endif
    enum Result : std::uint32_t { Error = 0, Ok = 2 };

    static std::string Silence() {
        return "silence";
    }

    /// A whole answer: its length, the result, one number, and what follows the fixed part.
    static std::string Answer(Result result, std::uint32_t number = 0,
                              std::string const& extra = "") {
        std::string answer(4008, '\0');
        answer += extra;
        std::uint32_t const head[] = {static_cast<std::uint32_t>(answer.size()), result, number};
        std::memcpy(&answer[0], head, sizeof head);
        return answer;
    }

    /// A script that tells libwbclient what it asks first, the protocol's version and the folder of
    /// the privileged socket, and answers the question itself with `answer`.
    static Script Greeting(std::string const& answer) {
        return [answer](std::uint32_t command) {
            switch (command) {
            case InterfaceVersion:
                return Answer(Ok, Protocol);
            case PrivilegedFolder:
                return Answer(Ok, 0, std::string(getenv("SELFTEST_WINBINDD_SOCKET_DIR")) + '\0');
            default: // any question
                return answer;
            }
        };
    }

    /// @param folder where the socket is; empty: in a folder of this object's, which the
    ///     environment names to libwbclient
    explicit FakeWinbindd(Script script, std::string folder = "") : _script(std::move(script)) {
        if (folder.empty()) {
            folder = _folder.Path();
        }
        EXPECT_EQ(0, chmod(folder.c_str(), 0755));
        sockaddr_un address = {};
        address.sun_family = AF_UNIX;
        std::string const path = folder + "/pipe";
        (void)unlink(path.c_str()); // one that an earlier object has left
        path.copy(address.sun_path, sizeof address.sun_path - 1);
        _listener = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
        EXPECT_EQ(0, bind(_listener, reinterpret_cast<sockaddr const*>(&address), sizeof address));
        EXPECT_EQ(0, listen(_listener, 64));
        EXPECT_EQ(0, setenv("SELFTEST_WINBINDD_SOCKET_DIR", folder.c_str(), 1));
        _thread = std::thread([this] { Serve(); });
    }

    FakeWinbindd(FakeWinbindd const&) = delete;
    FakeWinbindd& operator=(FakeWinbindd const&) = delete;

    /// Closes every connection, which ends who waits for an answer.
    ~FakeWinbindd() {
        _stop = true;
        _thread.join();
    }

    /// How many connections were made.
    unsigned Connections() const {
        return _connections;
    }

private:
    void Serve() {
        std::vector<pollfd> open = {{_listener, POLLIN, 0}};
        while (!_stop) {
            (void)poll(open.data(), open.size(), 10);
            for (std::size_t i = open.size(); i-- > 1;) {
                if (open[i].revents != 0 && !AnswerOne(open[i].fd)) {
                    (void)close(open[i].fd);
                    open.erase(open.begin() + static_cast<std::ptrdiff_t>(i));
                }
            }
            if (open[0].revents != 0) {
                open.push_back({accept4(_listener, nullptr, nullptr, SOCK_CLOEXEC), POLLIN, 0});
                ++_connections;
            }
        }
        for (pollfd const& each : open) {
            (void)close(each.fd); // the listener among them
        }
    }

    /// Reads one request; false where the connection is to be closed.
    bool AnswerOne(int connection) {
        constexpr std::size_t requestSize = 2136;
        char request[requestSize];
        if (recv(connection, request, sizeof request, MSG_WAITALL) !=
            static_cast<ssize_t>(sizeof request)) {
            return false;
        }
        std::uint32_t command = 0;
        std::memcpy(&command, request + sizeof command, sizeof command);
        std::string const answer = _script(command);
        return answer == Silence() ||
               (!answer.empty() && send(connection, answer.data(), answer.size(), MSG_NOSIGNAL) ==
                                       static_cast<ssize_t>(answer.size()));
    }

    TemporaryFolder _folder;
    Script _script;
    int _listener = -1;
    std::atomic<bool> _stop{false};
    std::atomic<unsigned> _connections{0};
    std::thread _thread;
};
