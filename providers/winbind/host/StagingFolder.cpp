// SPDX-License-Identifier: Apache-2.0
#include "host/StagingFolder.h"

#include "Failure.h"
#include "Paths.h"
#include "host/HostFile.h"
#include "text/KerberosConfiguration.h"

#include <base/FileError.h>
#include <base/WholeFile.h>
#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <filesystem>
#include <sys/file.h>
#include <sys/stat.h>
#include <system_error>

namespace tessel::winbind {

namespace {

constexpr mode_t readableByRoot = 0600;

void Write(std::string const& path, std::string_view text) {
    try {
        base::ReplaceFile(path, text, {base::Links::Replace, readableByRoot});
    } catch (base::FileError const& e) {
        throw Failure(CodeOfSystem(e.Error()), e.what());
    }
}

void RemoveTree(std::string const& path) noexcept {
    std::error_code ignored; // the next operation tries again
    std::filesystem::remove_all(path, ignored);
}

/// Makes a folder's user known to who cleans up. Ends with its process, whatever becomes of that.
/// @return none where the folder is somebody else's
base::Descriptor Hold(std::string const& folder) {
    base::Descriptor opened(
        ::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (opened && ::flock(opened.Get(), LOCK_EX | LOCK_NB) != 0) {
        return {};
    }
    return opened;
}

bool IsSameFolder(int descriptor, std::string const& path) {
    struct stat held = {};
    struct stat found = {};
    return ::fstat(descriptor, &held) == 0 && ::lstat(path.c_str(), &found) == 0 &&
           held.st_dev == found.st_dev && held.st_ino == found.st_ino;
}

} // namespace

StagingFolder::StagingFolder(std::string const& pattern) {
    // Who cleans up may take a new folder for a left one before it is held: then another one.
    constexpr int attempts = 100;
    for (int i = 0; i < attempts && !_hold; ++i) {
        _path = pattern;
        // mkdtemp(3) lets the owner alone in.
        if (!::mkdtemp(_path.data())) {
            ThrowSystemFailure("cannot make a folder '" + pattern + "'", errno);
        }
        _hold = Hold(_path);
        if (_hold && !IsSameFolder(_hold.Get(), _path)) {
            _hold.Close();
        }
    }
    if (!_hold) {
        RemoveTree(_path);
        throw Failure(TSLAUTH_WINBIND_SEE_SYSTEM_LOG, "cannot hold a folder '" + pattern + "'");
    }
    for (std::string const& folder : StagingDirectories(_path)) {
        if (::mkdir(folder.c_str(), 0700) != 0) {
            int const error = errno;
            RemoveTree(_path);
            ThrowSystemFailure("cannot make the folder '" + folder + "'", error);
        }
    }
}

StagingFolder::~StagingFolder() {
    RemoveTree(_path);
}

void StagingFolder::Configure(SambaDomain const& domain, std::string const& dnsName,
                              std::vector<std::string> const& controllers) {
    Write(Configuration(), StagedSambaDomainText(domain, _path));
    Write(KerberosConfiguration(), KerberosDomainText({domain.realm, dnsName, controllers}));
}

std::string StagingFolder::SecretsPath() const {
    return StagingDirectories(_path).front() + '/' + Paths::Secrets;
}

void StagingFolder::SetSecrets(std::string_view database) {
    Write(SecretsPath(), database);
}

void StagingFolder::SetKeytab(std::string_view keytab) {
    Write(KeytabPath(), keytab);
}

std::string StagingFolder::Keytab() const {
    return ReadHostFile(KeytabPath()).value_or("");
}

std::string StagingFolder::Memory() const {
    return _path + "/lock";
}

std::string StagingFolder::Secrets() const {
    return ReadHostFile(SecretsPath()).value_or("");
}

void StagingFolder::RemoveLeftOvers(std::string const& pattern) noexcept {
    std::filesystem::path const wanted = pattern;
    std::string const name = wanted.filename().string();
    std::string const start = name.substr(0, name.size() - 6);
    std::error_code error;
    std::filesystem::directory_iterator entry(wanted.parent_path(), error);
    while (!error && entry != std::filesystem::directory_iterator()) {
        std::string const found = entry->path().filename().string();
        if (found.size() == name.size() && found.compare(0, start.size(), start) == 0) {
            // Held while it goes, so that who has just made it takes another one.
            if (base::Descriptor const hold = Hold(entry->path().string())) {
                RemoveTree(entry->path().string());
            }
        }
        entry.increment(error);
    }
}

} // namespace tessel::winbind
