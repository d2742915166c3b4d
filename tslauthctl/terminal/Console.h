// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_CONSOLE_H
#define TSLAUTHCTL_CONSOLE_H

#include <nlohmann/json.hpp>

#include <stdexcept>
#include <string>
#include <string_view>

namespace tessel::tslauthctl {

/// How the process ends. The numbers are part of the interface: scripts depend on them.
enum class ExitCode {
    done = 0,
    failure = 1,
    usage = 2,
    notRoot = 3,
    refused = 4,
    loss = 5,
    drift = 6,
    changes = 7,
    unreachable = 8,
    credentials = 9,
    notJoined = 10,
    joinedElsewhere = 11,
    untrusted = 12,
    locksOut = 13
};

/// The word for an exit code, as it stands in the JSON document.
char const* Word(ExitCode code);

/// Why a command could not do what it was asked to.
class Failure : public std::runtime_error {
public:
    /// @param exceptionClass the class of the library's exception, or empty
    Failure(ExitCode code, std::string const& message, std::string exceptionClass = {})
        : std::runtime_error(message), _code(code), _exceptionClass(std::move(exceptionClass)) {}

    ExitCode Code() const noexcept {
        return _code;
    }
    std::string const& ExceptionClass() const noexcept {
        return _exceptionClass;
    }

private:
    ExitCode _code;
    std::string _exceptionClass;
};

enum class Colour { automatic, always, never };

/// The only place that writes to the terminal, but for the question for a password. Text for people
/// is gathered and written at the end, in one go; with JSON it is one document instead. What comes
/// from files is to be given as it is: control characters are escaped here.
class Console {
public:
    Console(bool json, Colour colour);

    /// One line for people.
    void Line(std::string_view text);
    /// One line that must not be overlooked, and one that may be.
    void Warning(std::string_view text);
    void Note(std::string_view text);
    /// What keeps the host from working as it was told to; with JSON the field "warnings".
    void Warnings(std::vector<std::string> const& texts);
    /// A unified diff.
    void Diff(std::string_view text);

    /// One step of a command, at once, to the error stream, if people read it and `ShowDetails` has
    /// been asked for.
    void Detail(std::string_view text);
    void ShowDetails(bool show) noexcept {
        _details = show;
    }

    /// At once, to the error stream, if people read it: why nothing happens.
    void Waiting(std::string_view text);

    /// As `Waiting`, but only if somebody sits there; the next one takes its place, and
    /// `EndProgress` leaves nothing of it.
    void Progress(std::string_view text);
    void EndProgress();

    /// At once, to the error stream: what is not finished, before the process ends by a signal.
    void Interrupted(std::string_view text);

    /// To the error stream; in the JSON document, "error".
    void Error(Failure const& failure);
    /// To the error stream, below an error. Not for JSON, which has it in fields.
    void ErrorDetail(std::string_view text);

    nlohmann::json& Document() {
        return _document;
    }

    /// Writes everything.
    /// @return the exit code for the process: `code`, or `failure` where it cannot be written
    int Finish(ExitCode code);

private:
    void Coloured(char const* colour, std::string_view text);

    bool _json;
    bool _colour;
    bool _progress = false;
    bool _details = false;
    std::string _text;
    std::string _errors;
    nlohmann::json _document;
};

} // namespace tessel::tslauthctl

#endif
