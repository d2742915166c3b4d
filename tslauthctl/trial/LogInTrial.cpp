// SPDX-License-Identifier: Apache-2.0
#include "trial/LogInTrial.h"

#include "analysis/HostFile.h"
#include "analysis/Policies.h"
#include "history/HistoryArchive.h"
#include "setup/SetupHost.h"
#include "setup/SetupPaths.h"
#include "setup/SetupPlan.h"
#include "terminal/Console.h"

#include <base/AsciiText.h>
#include <base/Descriptor.h>
#include <base/FileError.h>
#include <base/WholeFile.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <iterator>
#include <poll.h>
#include <pwd.h>
#include <sched.h>
#include <security/pam_appl.h>
#include <set>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

namespace tessel::tslauthctl {

namespace {

/// Those through which people come in.
constexpr char const* services[] = {"login", "sshd", "su", "sudo"};

/// With each answer: a busy host takes long for all of them, and a module that hangs for one.
constexpr std::chrono::seconds patience(10);

constexpr char cannotBeTried[] = "cannot be tried";

/// Nobody answers: what wants a password is no part of the trial.
int Refuse(int /*count*/, pam_message const** /*messages*/, pam_response** /*responses*/,
           void* /*data*/) {
    return PAM_CONV_ERR;
}

std::string AccountAnswer(LogIn const& logIn) {
    if (access((Paths::ServiceFolder + logIn.first).c_str(), F_OK) != 0) {
        return NoSuchService; // libpam would ask the policy of all others
    }
    pam_conv const conversation = {Refuse, nullptr};
    pam_handle_t* handle = nullptr;
    int result = pam_start(logIn.first.c_str(), logIn.second.c_str(), &conversation, &handle);
    if (result == PAM_SUCCESS) {
        (void)pam_set_item(handle, PAM_TTY, "tty1"); // pam_access wants to know whence
        result = pam_acct_mgmt(handle, PAM_SILENT);
    }
    std::string answer = result == PAM_SUCCESS ? LetIn : pam_strerror(handle, result);
    if (handle != nullptr) {
        pam_end(handle, result);
    }
    return answer;
}

std::string NameAnswer(std::string const& user) {
    errno = 0;
    auto const* const entry = getpwnam(user.c_str());
    return entry == nullptr ? "nobody is found"
                            : "number " + std::to_string(entry->pw_uid) + ", " + entry->pw_dir +
                                  ", " + entry->pw_shell;
}

void Tell(int output, std::string const& line) {
    ssize_t const written = write(output, line.data(), line.size());
    (void)written; // a line that does not come is an answer, too
}

constexpr std::string_view layered = "/etc/";

bool IsLayered(std::string const& path) {
    return base::AsciiText::StartsWith(path, layered);
}

/// Lays a text over a file that a link of /etc leads to: the file itself is the host's.
bool LayOver(std::string const& path, std::string const& text) {
    std::string const stand = std::string(HistoryFolder) + "/stand-in";
    PutOnHost(stand, text);
    return mount(stand.c_str(), path.c_str(), nullptr, MS_BIND, nullptr) == 0 &&
           unlink(stand.c_str()) == 0;
}

bool PutText(std::string const& path, std::string const& text) {
    auto const destination = base::Destination(path);
    if (!IsLayered(destination)) {
        return LayOver(destination, text);
    }
    for (auto const& folder : MissingFolders(destination)) {
        MakeFolder(folder);
    }
    PutOnHost(destination, text);
    return true;
}

/// Only what is below /etc, where nothing is the host's any more.
bool PutTexts(PlannedTexts const& texts) {
    for (auto const& [path, text] : texts) {
        if (IsLayered(path) &&
            !(text ? PutText(path, *text) : unlink(path.c_str()) == 0 || errno == ENOENT)) {
            return false;
        }
    }
    return true;
}

/// A view of the host of which nobody else knows, with a layer over /etc.
bool EnterPrivateView() {
    // The folder is there, and nothing of a log-in is in it.
    std::string const layers = HistoryFolder;
    auto const options = "lowerdir=/etc,upperdir=" + layers + "/upper,workdir=" + layers + "/work";
    return unshare(CLONE_NEWNS) == 0 &&
           mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 &&
           mount("trial", layers.c_str(), "tmpfs", 0, "mode=0700") == 0 &&
           mkdir((layers + "/upper").c_str(), 0755) == 0 &&
           mkdir((layers + "/work").c_str(), 0755) == 0 &&
           mount("trial", "/etc", "overlay", 0, options.c_str()) == 0;
}

[[noreturn]] void AskInChild(int output, std::vector<LogIn> const& logIns,
                             PlannedTexts const& texts) {
    try {
        if (!texts.empty() && !(EnterPrivateView() && PutTexts(texts))) {
            Tell(output, std::string(cannotBeTried) + "\t" + base::SystemText(errno) + "\t\n");
            _exit(0);
        }
        for (auto const& logIn : logIns) {
            auto const answer =
                logIn.first == NameServiceTrial ? NameAnswer(logIn.second) : AccountAnswer(logIn);
            Tell(output, logIn.first + "\t" + logIn.second + "\t" + answer + "\n");
        }
    } catch (std::exception const& e) {
        Tell(output, std::string(cannotBeTried) + "\t" + e.what() + "\t\n");
    }
    _exit(0);
}

/// What comes until the other end is closed, or keeps silent for too long.
std::string ReadAnswers(int input) {
    auto deadline = std::chrono::steady_clock::now() + patience;
    std::string text;
    for (;;) {
        auto const left = std::chrono::duration_cast<std::chrono::milliseconds>(
            deadline - std::chrono::steady_clock::now());
        pollfd waited = {input, POLLIN, 0};
        int const ready = left.count() > 0 ? poll(&waited, 1, static_cast<int>(left.count())) : 0;
        if (ready < 0 && errno == EINTR) {
            continue;
        }
        char buffer[4096];
        auto const count = ready > 0 ? read(input, buffer, sizeof buffer) : 0;
        if (count <= 0) {
            return text;
        }
        text.append(buffer, static_cast<std::size_t>(count));
        deadline = std::chrono::steady_clock::now() + patience;
    }
}

LogInAnswers AnswersIn(std::string_view text) {
    LogInAnswers answers;
    for (auto const line : base::AsciiText::Lines(text)) {
        auto const first = line.find('\t');
        auto const second = first == std::string_view::npos ? first : line.find('\t', first + 1);
        if (second != std::string_view::npos) {
            auto const answer = line.substr(second + 1);
            answers[{std::string(line.substr(0, first)),
                     std::string(line.substr(first + 1, second - first - 1))}] =
                std::string(answer.substr(0, answer.find('\n')));
        }
    }
    return answers;
}

LogInAnswers Ask(std::vector<LogIn> const& logIns, PlannedTexts const& texts) {
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0) {
        throw Failure(ExitCode::failure, "Cannot make a pipe: " + base::SystemText(errno));
    }
    base::Descriptor const input(ends[0]);
    base::Descriptor output(ends[1]);
    pid_t const child = fork();
    if (child < 0) {
        throw Failure(ExitCode::failure, "Cannot start a process: " + base::SystemText(errno));
    }
    if (child == 0) {
        AskInChild(output.Get(), logIns, texts);
    }
    output.Close();
    auto const text = ReadAnswers(input.Get());
    (void)kill(child, SIGKILL); // it has ended, or hangs in a module
    while (waitpid(child, nullptr, 0) < 0 && errno == EINTR) {
    }
    return AnswersIn(text);
}

std::vector<LogIn> LogInsOnHost() {
    char const* const caller = std::getenv("SUDO_USER");
    auto const users =
        UsersToTry(HostFileOrNothing("/etc/passwd").value_or(""),
                   HostFileOrNothing("/etc/group").value_or(""), caller == nullptr ? "" : caller);
    std::set<std::string> ways(std::begin(services), std::end(services));
    ways.insert({NameServiceTrial, Paths::PAMPolicyName});
    for (auto const& path : FilesThatFollow(PoliciesOnHost())) {
        ways.insert(path.substr(path.rfind('/') + 1));
    }
    std::vector<LogIn> logIns;
    for (auto const& user : users) {
        for (auto const& way : ways) {
            logIns.emplace_back(way, user);
        }
    }
    return logIns;
}

void RequireNoneLost(LogInAnswers const& before, LogInAnswers const& after) {
    auto const lost = LogInsLost(before, after);
    if (lost.empty()) {
        return;
    }
    std::string text = "The result was tried, and locks out who must get in";
    for (auto const& sentence : lost) {
        text += "; " + sentence;
    }
    throw Failure(ExitCode::locksOut, text);
}

} // namespace

LogInTrial::LogInTrial() : _logIns(LogInsOnHost()), _before(Ask(_logIns, {})) {}

void LogInTrial::Require(PlannedTexts const& texts, Console& console) const {
    MakeHistoryFolder();
    auto const after = Ask(_logIns, texts);
    if (!after.empty() && after.begin()->first.first == cannotBeTried) {
        console.Document()["tried"] = false;
        console.Warning("the result could not be tried before the change: " +
                        after.begin()->first.second);
        return;
    }
    console.Document()["tried"] = true;
    RequireNoneLost(_before, after);
}

void LogInTrial::RequireNow() const {
    auto after = Ask(_logIns, {});
    for (auto& [logIn, answer] : after) {
        if (logIn.first == Paths::PAMPolicyName) {
            answer = NoSuchService; // who goes by it is asked about under his own name
        }
    }
    RequireNoneLost(_before, after);
}

} // namespace tessel::tslauthctl
