// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <exception>
#include <string>

namespace tessel::base {

/// The system's text for an error number, as strerror(3) gives it, but safe with threads.
std::string SystemText(int error);

/// What ends the reading or replacing of a file. Each library turns it into a failure of its own.
class FileError : public std::exception {
public:
    /// @param operation what was tried, as a verb: "read"
    /// @param error the system's number
    FileError(std::string operation, std::string path, int error);
    /// @param reason in words, where it is not the system that refuses
    FileError(std::string operation, std::string path, std::string reason);
    ~FileError() override;

    std::string const& Operation() const noexcept {
        return _operation;
    }
    std::string const& Path() const noexcept {
        return _path;
    }
    /// 0 where the system did not refuse.
    int Error() const noexcept {
        return _error;
    }
    std::string const& Reason() const noexcept {
        return _reason;
    }
    /// "Cannot read '/etc/hosts': Permission denied"
    char const* what() const noexcept override;

private:
    std::string _operation;
    std::string _path;
    int _error = 0;
    std::string _reason;
    std::string _text;
};

} // namespace tessel::base
