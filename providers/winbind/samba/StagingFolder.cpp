// SPDX-License-Identifier: Apache-2.0
#include "samba/StagingFolder.h"

#include "Failure.h"
#include "Paths.h"
#include "host/HostFile.h"
#include "text/KerberosConfiguration.h"

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sys/stat.h>
#include <system_error>
#include <tslauth/AtomicFileStream.h>
#include <tslauth/Exception.h>

namespace tessel::winbind {

namespace {

/// The folder lies in memory: nothing is lost there that a sync could keep.
void Write(std::string const& path, std::string_view text) {
    try {
        authentication::AtomicFileStream stream(path.c_str(), std::ios::out);
        stream.write(text.data(), static_cast<std::streamsize>(text.size()));
        stream.Sync();
        stream.Commit();
    } catch (authentication::Exception const& e) {
        throw Failure(SeeSystemLog, e.what());
    }
}

void RemoveTree(std::string const& path) noexcept {
    std::error_code ignored; // the next operation tries again
    std::filesystem::remove_all(path, ignored);
}

} // namespace

StagingFolder::StagingFolder() : _path(Paths::Staging) {
    // mkdtemp(3) lets the owner alone in.
    if (!::mkdtemp(_path.data())) {
        ThrowSystemFailure("cannot make a folder '" + std::string(Paths::Staging) + "'", errno);
    }
    try {
        for (std::string const& folder : StagingDirectories(_path)) {
            if (::mkdir(folder.c_str(), 0700) != 0) {
                ThrowSystemFailure("cannot make the folder '" + folder + "'", errno);
            }
        }
    } catch (...) {
        RemoveTree(_path);
        throw;
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

std::string StagingFolder::Memory() const {
    return _path + "/lock";
}

std::string StagingFolder::Secrets() const {
    return ReadHostFile(SecretsPath()).value_or("");
}

void StagingFolder::RemoveLeftOvers() noexcept {
    std::filesystem::path const pattern = Paths::Staging;
    std::string const name = pattern.filename().string();
    std::string const start = name.substr(0, name.size() - 6);
    std::error_code error;
    std::filesystem::directory_iterator entry(pattern.parent_path(), error);
    while (!error && entry != std::filesystem::directory_iterator()) {
        std::string const found = entry->path().filename().string();
        if (found.size() == name.size() && found.compare(0, start.size(), start) == 0 &&
            entry->symlink_status(error).type() == std::filesystem::file_type::directory) {
            RemoveTree(entry->path().string());
        }
        entry.increment(error);
    }
}

} // namespace tessel::winbind
