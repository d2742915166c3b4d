// SPDX-License-Identifier: Apache-2.0
#include "host/ChildProcess.h"

#include "../../TemporaryFolder.h"
#include "Failure.h"

#include <atomic>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <gmock/gmock.h>
#include <string>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace tessel::winbind {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;
using testing::HasSubstr;
using testing::Lt;
using testing::Not;

// The tests run a shell, as a program like any other; the class itself uses none.
ChildProcess::Outcome Shell(std::string const& script, Clock::duration within = seconds(10),
                            std::vector<SecretFile const*> const& secrets = {}) {
    ChildProcess::Task task;
    task.arguments = {"sh", "-c", script};
    task.secrets = secrets;
    return ChildProcess::Run(task, Clock::now() + within);
}

bool IsGone(pid_t process) {
    for (int i = 0; i < 100; ++i) {
        if (::kill(process, 0) != 0 && errno == ESRCH) {
            return true;
        }
        std::this_thread::sleep_for(milliseconds(20));
    }
    return false;
}

TEST(ChildProcessTest, ReturnsCodeAndBothOutputs) {
    auto const outcome = Shell("echo out; echo err >&2; exit 7");
    EXPECT_EQ(7, outcome.code);
    EXPECT_FALSE(outcome.timedOut);
    EXPECT_EQ("out\nerr\n", outcome.output);
}

TEST(ChildProcessTest, TellsASignalFromACode) {
    EXPECT_EQ(128 + SIGTERM, Shell("kill -TERM $$").code);
}

TEST(ChildProcessTest, HandsArgumentsOverUnchanged) {
    ChildProcess::Task task;
    task.arguments = {"printf", "%s|", " a b", "$HOME", "'\"", "*", ""};
    EXPECT_EQ(" a b|$HOME|'\"|*||", ChildProcess::Run(task, Clock::now() + seconds(10)).output);
}

TEST(ChildProcessTest, HasAnEnvironmentOfItsOwn) {
    ::setenv("TSLAUTH_CHILD_TEST", "inherited", 1);
    ChildProcess::Task task;
    task.arguments = {"env"};
    task.environment = {"ADDED=yes"};
    EXPECT_EQ("PATH=/usr/sbin:/usr/bin:/sbin:/bin\nLC_ALL=C\nADDED=yes\n",
              ChildProcess::Run(task, Clock::now() + seconds(10)).output);
    ::unsetenv("TSLAUTH_CHILD_TEST");
}

TEST(ChildProcessTest, StartsWithoutCoreDumpsTerminalAndInput) {
    auto const outcome =
        Shell("ulimit -c; pwd; cat; (: </dev/tty) 2>/dev/null || echo no terminal");
    EXPECT_EQ("0\n/\nno terminal\n", outcome.output);
}

TEST(ChildProcessTest, ReportsAProgramThatIsNotInstalled) {
    ChildProcess::Task task;
    task.arguments = {"tslauth-no-such-program"};
    try {
        ChildProcess::Run(task, Clock::now() + seconds(10));
        FAIL();
    } catch (Failure const& e) {
        EXPECT_EQ(1060U, e.Code());
        EXPECT_STREQ("the program 'tslauth-no-such-program' is not installed", e.what());
    }
}

TEST(ChildProcessTest, ReportsAProgramThatCannotBeExecuted) {
    TemporaryFolder const folder;
    std::string const path = folder / "program";
    SetContents(path, "\x7f"
                      "ELF but not really");
    ASSERT_EQ(0, ::chmod(path.c_str(), 0755));
    ChildProcess::Task task;
    task.arguments = {path};
    try {
        ChildProcess::Run(task, Clock::now() + seconds(10));
        FAIL();
    } catch (Failure const& e) {
        EXPECT_EQ(TSLAUTH_WINBIND_SEE_SYSTEM_LOG, e.Code());
        EXPECT_EQ("cannot start '" + path + "': Exec format error", e.what());
    }
}

TEST(ChildProcessTest, EndsTheWholeGroupAtTheDeadline) {
    auto const start = Clock::now();
    // One that ignores the polite signals, and one behind it that holds the output open.
    auto const outcome =
        Shell("trap '' TERM INT HUP; sleep 300 & echo $!; echo $$; wait", milliseconds(300));
    EXPECT_THAT(Clock::now() - start, Lt(seconds(5)));
    EXPECT_TRUE(outcome.timedOut);
    EXPECT_EQ(137, outcome.code);
    std::size_t length = 0;
    pid_t const sleeper = std::stoi(outcome.output, &length);
    EXPECT_TRUE(IsGone(sleeper));
    EXPECT_TRUE(IsGone(std::stoi(outcome.output.substr(length))));
}

TEST(ChildProcessTest, StartsNothingThatOutlivesAPastDeadline) {
    TemporaryFolder const folder;
    EXPECT_TRUE(Shell("sleep 1; : >" + folder / "made", milliseconds(-1)).timedOut);
    std::this_thread::sleep_for(milliseconds(1200));
    EXPECT_TRUE(folder.Names().empty());
}

TEST(ChildProcessTest, DoesNotWaitForADaemon) {
    auto const start = Clock::now();
    auto const outcome = Shell("setsid sh -c 'echo $$; exec sleep 30' & sleep 0.2");
    EXPECT_THAT(Clock::now() - start, Lt(seconds(5)));
    pid_t const daemon = std::stoi(outcome.output);
    EXPECT_EQ(0, ::kill(daemon, 0));
    ::kill(daemon, SIGKILL);
}

TEST(ChildProcessTest, KeepsTheFirstMebibyteOfALongOutput) {
    auto const outcome = Shell("head -c 3000000 /dev/zero; echo end");
    EXPECT_EQ(0, outcome.code);
    EXPECT_EQ(1024U * 1024U, outcome.output.size());
}

TEST(ChildProcessTest, WorksWhereTheHostIgnoresTheEndOfItsChildren) {
    auto* const old = std::signal(SIGCHLD, SIG_IGN);
    auto const outcome = Shell("sh -c 'exit 3'; exit $?"); // its own children must count, too
    std::signal(SIGCHLD, old);
    EXPECT_EQ(3, outcome.code);
}

std::atomic<int> signalsOfChildren(0);

TEST(ChildProcessTest, SendsTheHostNoSignal) {
    auto* const old = std::signal(SIGCHLD, [](int) { ++signalsOfChildren; });
    EXPECT_EQ(0, Shell("exit 0").code);
    std::signal(SIGCHLD, old);
    EXPECT_EQ(0, signalsOfChildren);
}

TEST(ChildProcessTest, KeepsItsStatusFromAHostThatWaitsForAnyChild) {
    std::atomic<bool> done(false);
    std::atomic<int> stolen(0);
    std::thread thief([&] {
        while (!done) {
            if (::waitpid(-1, nullptr, WNOHANG) > 0) {
                ++stolen;
            }
        }
    });
    for (int i = 0; i < 20; ++i) {
        EXPECT_EQ(5, Shell("exit 5").code);
    }
    done = true;
    thief.join();
    EXPECT_EQ(0, stolen);
}

TEST(ChildProcessTest, LeavesNoChildBehind) {
    EXPECT_EQ(0, Shell("exit 0").code);
    EXPECT_EQ(-1, ::waitpid(-1, nullptr, WNOHANG | __WALL));
    EXPECT_EQ(ECHILD, errno);
}

TEST(ChildProcessTest, GivesTheProgramTheSecretsAndNoOtherDescriptor) {
    int const leaked = ::open("/dev/null", O_RDONLY); // without close-on-exec, as a careless host
    SecretFile const first({" \"one\" #\n"});
    SecretFile const second({"two"});
    auto const outcome = Shell("cat /proc/self/fd/3; cat /proc/self/fd/4; echo; ls /proc/self/fd",
                               seconds(10), {&first, &second});
    ::close(leaked);
    // 5 is the folder that the listing itself has open.
    EXPECT_EQ(" \"one\" #\ntwo\n0\n1\n2\n3\n4\n5\n", outcome.output);
}

TEST(ChildProcessTest, TheSecretCanBeReadAgainAndAgain) {
    SecretFile const secret({"word"});
    EXPECT_EQ("wordword",
              Shell("cat /proc/self/fd/3; cat /proc/self/fd/3", seconds(10), {&secret}).output);
}

TEST(ChildProcessTest, ShowsNothingOfASecretInArgumentsAndEnvironment) {
    SecretFile const secret({"hush"});
    auto const outcome = Shell("tr '\\0' ' ' </proc/$$/cmdline; tr '\\0' ' ' </proc/$$/environ",
                               seconds(10), {&secret});
    EXPECT_THAT(outcome.output, HasSubstr("LC_ALL=C"));
    EXPECT_THAT(outcome.output, Not(HasSubstr("hush")));
}

TEST(ChildProcessTest, LeavesNoDescriptorOpenInTheHost) {
    auto const count = [] {
        int open = 0;
        for (int number = 0; number < 256; ++number) {
            open += ::fcntl(number, F_GETFD) >= 0 ? 1 : 0;
        }
        return open;
    };
    int const before = count();
    (void)Shell("exit 0");
    EXPECT_TRUE(Shell("sleep 60", milliseconds(50)).timedOut);
    EXPECT_EQ(before, count());
}

TEST(ChildProcessTest, WorksWithTheStandardDescriptorsClosed) {
    std::vector<int> kept;
    for (int number = 0; number < 3; ++number) {
        kept.push_back(::fcntl(number, F_DUPFD_CLOEXEC, 100));
        ::close(number);
    }
    SecretFile const secret({"word"}); // at 0, which is the program's input otherwise
    auto const outcome = Shell("cat; cat /proc/self/fd/3; echo err >&2", seconds(10), {&secret});
    for (int number = 0; number < 3; ++number) {
        ::dup2(kept[static_cast<std::size_t>(number)], number);
        ::close(kept[static_cast<std::size_t>(number)]);
    }
    EXPECT_EQ("worderr\n", outcome.output);
}

TEST(ChildProcessTest, RunsFromManyThreadsAtOnce) {
    std::vector<std::thread> threads;
    std::atomic<int> right(0);
    for (int i = 0; i < 16; ++i) {
        threads.emplace_back([&right, i] {
            auto const outcome = Shell("echo " + std::to_string(i) + "; exit " + std::to_string(i));
            right += outcome.code == i && outcome.output == std::to_string(i) + "\n" ? 1 : 0;
        });
    }
    for (auto& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(16, right);
}

TEST(ChildProcessTest, EndsTheProgramWhenTheHostDies) {
    TemporaryFolder const folder;
    std::string const path = folder / "process";
    pid_t const host = ::fork();
    if (host == 0) {
        (void)Shell("echo $$ >" + path + ".new; mv " + path + ".new " + path + "; exec sleep 300",
                    seconds(300));
        ::_exit(0);
    }
    while (::access(path.c_str(), F_OK) != 0) {
        std::this_thread::sleep_for(milliseconds(10));
    }
    pid_t const program = std::stoi(Contents(path));
    ::kill(host, SIGKILL);
    ::waitpid(host, nullptr, 0);
    EXPECT_TRUE(IsGone(program));
}

} // namespace
} // namespace tessel::winbind
