// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_SYSTEM_SYSTEMLOG_H
#define TESTS_SYSTEM_SYSTEMLOG_H

#include "Node.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <mutex>
#include <poll.h>
#include <string>
#include <sys/mount.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <sys/un.h>
#include <syslog.h>
#include <thread>
#include <unistd.h>
#include <vector>

/// The system log of a node, as the socket that syslog(3) writes to. What is logged while an object
/// lives is kept; there is one at a time.
///
/// A thread reads all the time: the kernel keeps ten messages of a socket nobody reads, and makes
/// the eleventh writer wait.
class SystemLog {
public:
    SystemLog() {
        MakePrivateDevices();
        _socket = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
        EXPECT_LE(0, _socket) << strerror(errno);
        sockaddr_un address = {};
        address.sun_family = AF_UNIX;
        strcpy(address.sun_path, Path);
        (void)unlink(Path); // one that an earlier object has left
        EXPECT_EQ(0, bind(_socket, reinterpret_cast<sockaddr const*>(&address), sizeof address))
            << strerror(errno);
        closelog(); // syslog keeps its connection, which may be to an earlier object
        _reader = std::thread([this] { ReadAll(); });
    }
    SystemLog(SystemLog const&) = delete;
    SystemLog& operator=(SystemLog const&) = delete;
    ~SystemLog() {
        _isEnding = true;
        _reader.join();
        close(_socket);
        (void)unlink(Path); // in the node's own /dev, which goes with it
    }

    /// What has been logged so far, in order: "<priority> text". A message is there when the call
    /// that logs it has returned.
    std::vector<std::string> Messages() {
        std::lock_guard<std::mutex> const lock(_mutex);
        Receive();
        return _messages;
    }

    void Forget() {
        std::lock_guard<std::mutex> const lock(_mutex);
        Receive();
        _messages.clear();
    }

    /// What `Messages` shows of a warning.
    static std::string Warning(std::string const& text) {
        return "<" + std::to_string(LOG_USER | LOG_WARNING) + "> " + text;
    }

    /// Puts a /dev over the machine's own, with nothing but a few devices: what is logged then
    /// reaches nobody. Once a process.
    static void MakePrivateDevices() {
        static bool const isDone = [] {
            struct Device {
                char const* path;
                unsigned minor;
            };
            EXPECT_EQ(0, mount("node", "/dev", "tmpfs", 0, "mode=0755")) << strerror(errno);
            for (Device const device :
                 {Device{"/dev/null", 3}, Device{"/dev/zero", 5}, Device{"/dev/full", 7},
                  Device{"/dev/random", 8}, Device{"/dev/urandom", 9}}) {
                EXPECT_EQ(0, mknod(device.path, S_IFCHR | 0666, makedev(1, device.minor)))
                    << device.path << ": " << strerror(errno);
            }
            return true;
        }();
        (void)isDone; // the work is in making it
    }

private:
    static constexpr char const* Path = "/dev/log";

    void ReadAll() {
        while (!_isEnding) {
            pollfd ready = {_socket, POLLIN, 0};
            if (poll(&ready, 1, 10) > 0) {
                std::lock_guard<std::mutex> const lock(_mutex);
                Receive();
            }
        }
    }

    /// "<priority>time program: text" becomes "<priority> text".
    void Receive() {
        char buffer[4096];
        for (ssize_t size; (size = recv(_socket, buffer, sizeof buffer, MSG_DONTWAIT)) > 0;) {
            std::string const message(buffer, static_cast<std::size_t>(size));
            _messages.push_back(message.substr(0, message.find('>') + 1) +
                                message.substr(message.find(": ") + 1));
        }
    }

    int _socket = -1;
    std::mutex _mutex;
    std::vector<std::string> _messages;
    std::atomic<bool> _isEnding{false};
    std::thread _reader;
};

#endif
