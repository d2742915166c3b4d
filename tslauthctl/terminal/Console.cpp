// SPDX-License-Identifier: Apache-2.0
#include "terminal/Console.h"

#include "terminal/EscapedText.h"

#include <base/AsciiText.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <sys/ioctl.h>
#include <unistd.h>
#include <utility>

namespace tessel::tslauthctl {

namespace {

constexpr char red[] = "\x1b[31m";
constexpr char green[] = "\x1b[32m";
constexpr char cyan[] = "\x1b[36m";
constexpr char bold[] = "\x1b[1m";
constexpr char dim[] = "\x1b[2m";
constexpr char plain[] = "\x1b[0m";

bool Set(char const* variable) {
    char const* const value = std::getenv(variable);
    return value != nullptr && *value != '\0';
}

bool WantsColour(Colour colour) {
    switch (colour) {
    case Colour::always:
        return true;
    case Colour::never:
        return false;
    case Colour::automatic:
        break;
    }
    char const* const terminal = std::getenv("TERM");
    return !Set("NO_COLOR") && isatty(STDOUT_FILENO) == 1 &&
           (terminal == nullptr || std::strcmp(terminal, "dumb") != 0);
}

constexpr char clearLine[] = "\r\x1b[K";

/// Whether the error stream is a screen on which a line can be written anew.
bool CanOverwrite() {
    char const* const terminal = std::getenv("TERM");
    return isatty(STDERR_FILENO) == 1 && terminal != nullptr && *terminal != '\0' &&
           std::strcmp(terminal, "dumb") != 0;
}

/// @return false, with errno set, where not all of it could be written
bool WriteAll(int descriptor, std::string_view text) {
    while (!text.empty()) {
        auto const written = write(descriptor, text.data(), text.size());
        if (written > 0) {
            text.remove_prefix(static_cast<std::size_t>(written));
        } else if (written < 0 && errno != EINTR) {
            return false;
        }
    }
    return true;
}

} // namespace

char const* Word(ExitCode code) {
    switch (code) {
    case ExitCode::done:
        return "done";
    case ExitCode::failure:
        return "failure";
    case ExitCode::usage:
        return "usage";
    case ExitCode::notRoot:
        return "not-root";
    case ExitCode::refused:
        return "refused";
    case ExitCode::loss:
        return "loss";
    case ExitCode::drift:
        return "drift";
    case ExitCode::changes:
        return "changes";
    case ExitCode::unreachable:
        return "unreachable";
    case ExitCode::credentials:
        return "credentials";
    case ExitCode::notJoined:
        return "not-joined";
    case ExitCode::joinedElsewhere:
        return "joined-elsewhere";
    case ExitCode::untrusted:
        return "untrusted";
    case ExitCode::locksOut:
        return "locks-out";
    }
    return "failure";
}

Console::Console(bool json, Colour colour)
    : _json(json), _colour(WantsColour(colour)), _document(nlohmann::json::object()) {}

void Console::Coloured(char const* colour, std::string_view text) {
    if (_colour) {
        _text += colour;
        _text += text;
        _text += plain;
    } else {
        _text += text;
    }
    _text += '\n';
}

void Console::Line(std::string_view text) {
    _text += Escaped(text);
    _text += '\n';
}

void Console::Warning(std::string_view text) {
    Coloured(red, Escaped(text));
}

void Console::Warnings(std::vector<std::string> const& texts) {
    for (auto const& text : texts) {
        Warning("warning: " + text);
        _document["warnings"].push_back(text);
    }
}

void Console::Note(std::string_view text) {
    Coloured(dim, Escaped(text));
}

void Console::Diff(std::string_view text) {
    for (auto line : base::AsciiText::Lines(text)) {
        line = line.substr(0, line.find('\n'));
        auto const shown = Escaped(line);
        if (line.substr(0, 4) == "--- " || line.substr(0, 4) == "+++ ") {
            Coloured(bold, shown);
        } else if (line.front() == '+') {
            Coloured(green, shown);
        } else if (line.front() == '-') {
            Coloured(red, shown);
        } else if (line.front() == '@') {
            Coloured(cyan, shown);
        } else {
            _text += shown;
            _text += '\n';
        }
    }
}

void Console::Waiting(std::string_view text) {
    // Also where it is no terminal: who reads a log wants to know what a command hangs on.
    if (!_json) {
        // Nothing depends on it.
        (void)WriteAll(STDERR_FILENO, "tslauthctl: " + Escaped(text) + "\n");
    }
}

void Console::Detail(std::string_view text) {
    if (_details) {
        Waiting(text);
    }
}

void Console::Progress(std::string_view text) {
    if (!CanOverwrite()) {
        if (isatty(STDERR_FILENO) == 1 && !std::exchange(_progress, true)) {
            Waiting(text);
        }
        return;
    }
    auto shown = "tslauthctl: " + Escaped(text);
    winsize size = {};
    if (ioctl(STDERR_FILENO, TIOCGWINSZ, &size) == 0 && size.ws_col > 1) {
        // A line that is broken at the edge could not be overwritten.
        shown.resize(std::min<std::size_t>(shown.size(), size.ws_col - 1U));
        while ((static_cast<unsigned char>(shown.back()) & 0x80U) != 0) {
            shown.pop_back(); // nor is half a character shown
        }
    }
    _progress = true;
    (void)WriteAll(STDERR_FILENO, clearLine + shown); // nothing depends on it
}

void Console::EndProgress() {
    if (std::exchange(_progress, false) && CanOverwrite()) {
        (void)WriteAll(STDERR_FILENO, clearLine); // nor on this
    }
}

void Console::Interrupted(std::string_view text) {
    // The process ends whether it can be told or not.
    (void)WriteAll(STDERR_FILENO, "tslauthctl: " + Escaped(text) + "\n");
}

void Console::Error(Failure const& failure) {
    _errors += "tslauthctl: " + Escaped(failure.what()) + "\n";
    auto& error = _document["error"];
    error["message"] = failure.what();
    error["exception"] = nullptr;
    if (!failure.ExceptionClass().empty()) {
        error["exception"] = failure.ExceptionClass();
    }
    // A number that has no text here: only the provider knows what it met.
    if (failure.ExceptionClass() == "tessel::authentication::UnknownException") {
        ErrorDetail("the provider may have said more in the system log");
    }
}

void Console::ErrorDetail(std::string_view text) {
    _errors += "  " + Escaped(text) + "\n";
}

int Console::Finish(ExitCode code) {
    if (_json) {
        _document["schema"] = 1;
        _document["exit"] = static_cast<int>(code);
        _document["outcome"] = Word(code);
        // Bytes of files that are not UTF-8 cannot stand in JSON; they become U+FFFD. Whatever is
        // not ASCII is escaped: there are control characters among it.
        _text = _document.dump(2, ' ', true, nlohmann::json::error_handler_t::replace) + "\n";
    } else if (!WriteAll(STDERR_FILENO, _errors)) {
        code = ExitCode::failure;
    }
    if (!WriteAll(STDOUT_FILENO, _text)) {
        std::string const reason = std::strerror(errno);
        // The exit code tells it, too.
        (void)WriteAll(STDERR_FILENO, "tslauthctl: Cannot write the output: " + reason + "\n");
        code = ExitCode::failure;
    }
    return static_cast<int>(code);
}

} // namespace tessel::tslauthctl
