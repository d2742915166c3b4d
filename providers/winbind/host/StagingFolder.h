// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "text/SambaDomain.h"

#include <base/Descriptor.h>
#include <string>
#include <string_view>
#include <vector>

namespace tessel::winbind {

/// A folder of memory in which Samba's tools work with a configuration, secrets and caches of their
/// own, so that nothing of the host changes before it is known that the change is good. Removed
/// with everything in it.
class StagingFolder {
public:
    /// @param pattern of its path, as mkdtemp(3) takes it
    /// @throws Failure
    explicit StagingFolder(std::string const& pattern);
    StagingFolder(StagingFolder const&) = delete;
    StagingFolder& operator=(StagingFolder const&) = delete;
    ~StagingFolder();

    /// The tools' smb.conf and krb5.conf. May be called again when more is known of the domain.
    /// @param controllers the only ones that Kerberos asks; empty: those of DNS
    void Configure(SambaDomain const& domain, std::string const& dnsName,
                   std::vector<std::string> const& controllers);

    /// Puts the secrets there that the tools start from.
    void SetSecrets(std::string_view database);

    /// The secrets as the tools left them; empty where they made none.
    std::string Secrets() const;

    /// The same for a keytab.
    void SetKeytab(std::string_view keytab);
    std::string Keytab() const;

    std::string KeytabPath() const {
        return _path + "/krb5.keytab";
    }

    /// Where tools that work with the host's own configuration can keep what they remember.
    std::string Memory() const;

    std::string Configuration() const {
        return _path + "/smb.conf";
    }
    std::string KerberosConfiguration() const {
        return _path + "/krb5.conf";
    }

    /// Removes the folders of operations that did not end. One that is in use, a question's for
    /// one, is held by its user and stays.
    static void RemoveLeftOvers(std::string const& pattern) noexcept;

private:
    std::string SecretsPath() const;

    std::string _path;
    base::Descriptor _hold; ///< locked as long as the folder is in use
};

} // namespace tessel::winbind
