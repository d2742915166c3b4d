// SPDX-License-Identifier: Apache-2.0
#include "host/Membership.h"

#include "Failure.h"
#include "Paths.h"
#include "host/Host.h"
#include "host/HostFile.h"
#include "text/DirectoryNames.h"
#include "text/SambaInclude.h"

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

} // namespace

std::string Membership::DNSName() const {
    return DomainName(domain.realm);
}

std::optional<Membership> Membership::ReadOwnFile(Host const& host) {
    auto const own = ReadHostFile(host.At(Paths::OwnSamba));
    if (!own) {
        return std::nullopt;
    }
    auto domain = ReadSambaDomain(*own);
    if (!domain) {
        return std::nullopt;
    }
    return Membership{std::move(*domain), ReadRecord(*own)};
}

std::optional<Membership> Membership::Read(Host const& host) {
    auto membership = ReadOwnFile(host);
    auto const samba = ReadHostFile(host.At(Paths::Samba));
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

std::set<Membership::Made> Membership::ReadRecord(std::string const& text) {
    std::set<Made> made;
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

} // namespace tessel::winbind
