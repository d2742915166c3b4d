// SPDX-License-Identifier: Apache-2.0
#include "host/Membership.h"

#include "Failure.h"
#include "Paths.h"
#include "host/HostFile.h"
#include "text/DirectoryNames.h"
#include "text/SambaInclude.h"

#include <algorithm>
#include <climits>
#include <unistd.h>
#include <utility>

namespace tessel::winbind {

namespace {

constexpr char recordStart[] = "# Parting also takes away: ";

constexpr std::pair<Membership::Made, char const*> words[] = {
    {Membership::Made::SambaFile, "smb.conf"},
    {Membership::Made::KerberosFile, "krb5.conf"},
    {Membership::Made::KerberosFolder, "krb5.conf.d"},
    {Membership::Made::Daemon, "winbindd"},
};

std::set<Membership::Made> ReadRecord(std::string const& text) {
    std::set<Membership::Made> made;
    std::string::size_type const start = text.find(recordStart);
    if (start == std::string::npos) {
        return made;
    }
    std::string const line = text.substr(start, text.find('\n', start) - start) + ' ';
    for (auto const& [what, word] : words) {
        if (line.find(std::string(" ") + word + ' ') != std::string::npos) {
            made.insert(what);
        }
    }
    return made;
}

} // namespace

std::string Membership::DNSName() const {
    return DomainName(domain.realm);
}

std::optional<Membership> Membership::ReadOwnFile() {
    auto const own = ReadHostFile(Paths::OwnSamba);
    if (!own) {
        return std::nullopt;
    }
    auto domain = ReadSambaDomain(*own);
    if (!domain) {
        return std::nullopt;
    }
    return Membership{std::move(*domain), ReadRecord(*own)};
}

std::optional<Membership> Membership::Read() {
    auto membership = ReadOwnFile();
    auto const samba = ReadHostFile(Paths::Samba);
    if (!samba || !HasSambaInclude(*samba, Paths::OwnSamba)) {
        return std::nullopt;
    }
    return membership;
}

std::string Membership::Record(std::set<Made> const& made) {
    std::string line;
    for (auto const& [what, word] : words) {
        if (made.count(what) != 0) {
            line += (line.empty() ? "" : " ") + std::string(word);
        }
    }
    return line.empty() ? line : recordStart + line + '\n';
}

std::string HostComputerName() {
    char name[HOST_NAME_MAX + 1] = {};
    if (::gethostname(name, sizeof name - 1) != 0) {
        throw Failure(TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME, "the host's name cannot be read");
    }
    return ComputerName(name);
}

} // namespace tessel::winbind
