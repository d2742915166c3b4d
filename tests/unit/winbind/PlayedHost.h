// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "../../TemporaryFolder.h"
#include "Failure.h"
#include "GoldenText.h"
#include "Paths.h"
#include "host/Host.h"
#include "tslauth_winbind_provider.h"

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <functional>
#include <map>
#include <memory>
#include <new>
#include <stdexcept>
#include <string>
#include <sys/mman.h>
#include <sys/stat.h>
#include <utility>
#include <vector>

/// A host below a folder, with Samba's programs, winbindd, DNS and a domain that are played: it
/// counts what is asked of them, and any of it can be made to fail. What a child process has done
/// to it is known to its parent.
class PlayedHost : public tessel::winbind::Host {
public:
    /// How a call outside fails.
    enum class Fault {
        Refused,  ///< without an effect, and without a word that is known
        TimedOut, ///< without an effect
        Killed,   ///< by a signal, after its effect
    };

    /// What outlives a child process of the test.
    struct Shared {
        std::size_t calls;
        bool hasAccount;
        char created[32];
        bool daemonRuns;
        bool isTrusted;
        int restarts;
        char log[16384]; ///< the calls, one a line
    };

    /// The names of the domain that the golden answers are from.
    static constexpr char Domain[] = "corp.example";

    PlayedHost() : PlayedHost(std::make_unique<TemporaryFolder>()) {}

    ~PlayedHost() override {
        (void)::munmap(_shared, sizeof(Shared));
    }

    Shared& State() const {
        return *_shared;
    }

    /// The call with this number, counted from 1, fails.
    void FailAt(std::size_t call, Fault fault) {
        _faults[call] = fault;
    }
    void FailNowhere() {
        _faults.clear();
        _shared->calls = 0;
        _shared->log[0] = '\0';
    }

    /// What a controller says of its clock.
    void SetInfo(std::string text) {
        _info = std::move(text);
    }

    std::string const& Root() const {
        return _folder->Path();
    }
    void Write(std::string const& path, std::string const& text) const {
        SetContents(At(path), text);
    }
    std::string Read(std::string const& path) const {
        return Contents(At(path));
    }
    bool Has(std::string const& program) const override {
        return missing.find(' ' + program + ' ') == std::string::npos;
    }

    /// Every file and folder with its kind, mode and contents, but for what may stay.
    std::map<std::string, std::string> Tree() const {
        std::map<std::string, std::string> tree;
        for (auto const& entry : std::filesystem::recursive_directory_iterator(Root())) {
            std::string const path = entry.path().string();
            struct stat status = {};
            if (::lstat(path.c_str(), &status) != 0) {
                throw std::runtime_error("cannot look at " + path);
            }
            std::string text = std::to_string(status.st_mode) + ' ';
            if (entry.is_symlink()) {
                text += std::filesystem::read_symlink(entry.path()).string();
            } else if (entry.is_regular_file()) {
                text += Contents(path);
            }
            tree[path.substr(Root().size())] = text;
        }
        return tree;
    }

    std::string Name() const override {
        return "node.corp.example";
    }

    std::vector<std::string> AskDNS(std::string const& domain) const override {
        switch (Count("DNS " + domain)) {
        case Verdict::Works:
            break;
        default:
            throw tessel::winbind::Failure(TSLAUTH_PROVIDER_TIMED_OUT, "DNS is silent");
        }
        if (domain != Domain) {
            throw tessel::winbind::Failure(TSLAUTH_PROVIDER_NO_SUCH_DOMAIN, "no such domain");
        }
        return {"dc1.corp.example"};
    }

    tessel::winbind::ChildProcess::Outcome Run(tessel::winbind::ChildProcess::Task const& task,
                                               tessel::winbind::Clock::time_point) const override {
        std::string command;
        for (std::string const& argument : task.arguments) {
            command += (command.empty() ? "" : " ") + argument;
        }
        Verdict const verdict = Count(command);
        if (verdict == Verdict::Refused) {
            return {255, 0, false, "deliberate\n"};
        }
        if (verdict == Verdict::TimedOut) {
            return {137, 9, true, ""};
        }
        auto outcome = Played(task, command);
        if (verdict == Verdict::Killed) {
            return {137, 9, false, outcome.output};
        }
        return outcome;
    }

    std::shared_ptr<tessel::winbind::Daemon const>
    Winbindd(tessel::winbind::SambaFolders const&) const override {
        return std::make_shared<PlayedDaemon>(*this);
    }

    unsigned long long FreeBytes(std::string const& folder) const override {
        auto const found = free.find(folder.substr(std::min(folder.size(), Root().size())));
        return found == free.end() ? 1ULL << 40U : found->second;
    }

    // How the host and the domain are; may be changed before an operation.
    std::string password = "secret";
    std::string missing; ///< " net ": programs that are not installed
    std::string role = "ROLE_STANDALONE";
    std::string security = "AUTO";
    std::string joinText;   ///< what `net ads join` fails with; empty: it works
    bool hasSecret = false; ///< what the host's own secrets hold
    bool rejoins = false;   ///< the account was there before the join
    std::map<std::string, unsigned long long> free; ///< by folder; elsewhere there is room

    /// By a part of the command: what a search prints; without a "Got ", what it fails with.
    std::vector<std::pair<std::string, std::string>> directory;

private:
    enum class Verdict { Works, Refused, TimedOut, Killed };
    typedef tessel::winbind::ChildProcess::Outcome Outcome;

    class PlayedDaemon : public tessel::winbind::Daemon {
    public:
        explicit PlayedDaemon(PlayedHost const& host) : _host(host) {}

        bool Runs() const override {
            return _host._shared->daemonRuns;
        }
        bool IsAlone() const override {
            return true;
        }
        void Restart(tessel::winbind::Clock::time_point) const override {
            _host.Check("restart winbindd", TSLAUTH_PROVIDER_SERVICE_NOT_ACTIVE);
            _host._shared->daemonRuns = true;
            ++_host._shared->restarts;
            SetContents(_host.At("/var/lib/samba/winbindd_idmap.tdb"), "numbers");
            SetContents(_host.At("/var/cache/samba/winbindd_cache.tdb"), "cache");
        }
        void Stop(tessel::winbind::Clock::time_point) const override {
            _host.Check("stop winbindd", TSLAUTH_PROVIDER_SERVICE_CANNOT_ACCEPT_CONTROL);
            _host._shared->daemonRuns = false;
        }
        void Reload() const noexcept override {
            (void)_host.Count("reload winbindd"); // cannot be seen to fail
        }
        void CheckTrust(tessel::winbind::Clock::time_point) const override {
            _host.Check("check the trust", TSLAUTH_PROVIDER_NO_LOGON_SERVERS);
            if (!_host._shared->hasAccount) {
                throw tessel::winbind::Failure(TSLAUTH_PROVIDER_NO_TRUST_SAM_ACCOUNT, "no account");
            }
        }

    private:
        PlayedHost const& _host;
    };

    explicit PlayedHost(std::unique_ptr<TemporaryFolder> folder)
        : Host(folder->Path()), _folder(std::move(folder)) {
        void* const memory = ::mmap(nullptr, sizeof(Shared), PROT_READ | PROT_WRITE,
                                    MAP_SHARED | MAP_ANONYMOUS, -1, 0);
        if (memory == MAP_FAILED) {
            throw std::bad_alloc();
        }
        _shared = new (memory) Shared{};
        for (char const* const path :
             {"/etc/samba", "/run", "/var/lib/samba/private", "/var/cache/samba", "/var/log/samba",
              "/etc/tessel/tslauth"}) {
            std::filesystem::create_directories(At(path));
        }
        _lookup = GoldenText("controller/lookup.txt");
        _info = GoldenText("controller/info.txt");
    }

    Verdict Count(std::string const& call) const {
        std::size_t const number = ++_shared->calls;
        std::string const line = call + '\n';
        std::size_t const used = std::strlen(_shared->log);
        if (used + line.size() < sizeof _shared->log) {
            std::memcpy(_shared->log + used, line.c_str(), line.size() + 1);
        }
        auto const found = _faults.find(number);
        if (found == _faults.end()) {
            return Verdict::Works;
        }
        switch (found->second) {
        case Fault::Refused:
            return Verdict::Refused;
        case Fault::TimedOut:
            return Verdict::TimedOut;
        case Fault::Killed:
            return Verdict::Killed;
        }
        return Verdict::Works;
    }

    /// For what fails with a `Failure`.
    void Check(std::string const& call, tessel::winbind::Failure const& failure) const {
        if (Count(call) != Verdict::Works) {
            throw tessel::winbind::Failure(failure);
        }
    }
    void Check(std::string const& call, ActiveDirectoryClientErrorCode code) const {
        Check(call, tessel::winbind::Failure(code, "deliberate: " + call));
    }

    static bool Holds(std::string const& text, std::string const& part) {
        return text.find(part) != std::string::npos;
    }

    /// A program that cannot write fails.
    Outcome Played(tessel::winbind::ChildProcess::Task const& task,
                   std::string const& command) const {
        try {
            return Play(task, command);
        } catch (std::runtime_error const& e) {
            return {255, 0, false, e.what()};
        }
    }

    Outcome Play(tessel::winbind::ChildProcess::Task const& task,
                 std::string const& command) const {
        if (Holds(command, "testparm")) {
            return {0, 0, false, TestParm()};
        }
        if (Holds(command, " ads lookup")) {
            return {0, 0, false, _lookup};
        }
        if (Holds(command, " ads info")) {
            return {0, 0, false, _info};
        }
        if (Holds(command, " primarytrust dumpinfo")) {
            return {hasSecret ? 0 : 255, 0, false, ""};
        }
        if (Holds(command, " --machine-pass") ||
            (!directory.empty() && Holds(command, " ads search "))) {
            return Ask(command);
        }
        std::string const folder = StagingOf(task);
        if (Holds(command, " ads join ")) {
            return Join(task, folder);
        }
        if (Holds(command, " offlinejoin requestodj")) {
            SetContents(folder + "/private/secrets.tdb", "secrets of an offline join");
            return {0, 0, false, ""};
        }
        if (Holds(command, " ads keytab create ")) {
            std::string const path = folder + "/krb5.keytab";
            SetContents(path,
                        (std::filesystem::exists(path) ? Contents(path) : "") + "keys of node");
            return {0, 0, false, ""};
        }
        if (Holds(command, "smbcontrol ")) {
            return {0, 0, false, ""};
        }
        if (Holds(command, " ads dns register ")) {
            return {0, 0, false, "Successfully registered hostname with DNS\n"};
        }
        if (Holds(command, " ads search ")) {
            return {0, 0, false, Search(task.arguments.back())};
        }
        if (Holds(command, " ads leave ") &&
            !Holds(Contents(folder + "/private/secrets.tdb"), "secrets of")) {
            return {255, 0, false, "Unable to fetch domain sid: are we joined?\n"};
        }
        if (Holds(command, " ads leave ") || Holds(command, " ads user delete ")) {
            _shared->hasAccount = false;
            return {0, 0, false, ""};
        }
        throw std::runtime_error("not played: " + command);
    }

    Outcome Join(tessel::winbind::ChildProcess::Task const& task, std::string const& folder) const {
        if (!joinText.empty()) {
            return {255, 0, false, joinText};
        }
        if (PasswordIn(task) != password) {
            return {
                255, 0, false,
                "Failed to join domain: failed to lookup DC info for domain 'CORP' over rpc: The "
                "attempted logon is invalid. This is either due to a bad username or "
                "authentication information.\n"};
        }
        _shared->hasAccount = true;
        std::string const created = rejoins ? "20000101000000.0Z" : "29990101000000.0Z";
        _shared->created[created.copy(_shared->created, sizeof _shared->created - 1)] = '\0';
        SetContents(folder + "/private/secrets.tdb", "secrets of a join");
        return {0, 0, false, "Joined\n"};
    }

    /// What the directory says where a test has told it what to say.
    Outcome Ask(std::string const& command) const {
        for (auto const& [part, text] : directory) {
            if (Holds(command, part)) {
                return {Holds(text, "Got ") ? 0 : 255, 0, false, text};
            }
        }
        return {0, 0, false, "Got 0 replies\n\n"};
    }

    std::string Search(std::string const& attribute) const {
        if (!_shared->hasAccount) {
            return "Got 0 replies\n\n";
        }
        return "Got 1 replies\n\n" + attribute + ": " +
               (attribute == "whenCreated" ? std::string(_shared->created)
                                           : "CN=NODE,CN=Computers,DC=corp,DC=example") +
               "\n";
    }

    /// The folder of the configuration that `net` was given.
    static std::string StagingOf(tessel::winbind::ChildProcess::Task const& task) {
        auto const option = std::find(task.arguments.begin(), task.arguments.end(), "-s");
        return option == task.arguments.end() ? std::string()
                                              : option[1].substr(0, option[1].rfind('/'));
    }

    static std::string PasswordIn(tessel::winbind::ChildProcess::Task const& task) {
        char text[256] = {};
        int const file = task.secrets.at(1)->Descriptor();
        (void)!::pread(file, text, sizeof text - 1, 0); // empty where it cannot be read
        return text;
    }

    std::string TestParm() const {
        auto const line = [](std::string const& name, std::string const& value) {
            return '\t' + name + " = " + value + '\n';
        };
        return "[global]\n" + line("cache directory", At("/var/cache/samba")) +
               line("lock directory", At("/run/samba")) + line("pid directory", At("/run/samba")) +
               line("private dir", At("/var/lib/samba/private")) + line("security", security) +
               line("server role", role) + line("state directory", At("/var/lib/samba"));
    }

    std::unique_ptr<TemporaryFolder> _folder;
    Shared* _shared = nullptr;
    std::map<std::size_t, Fault> _faults;
    std::string _lookup;
    std::string _info;
};
