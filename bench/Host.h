// SPDX-License-Identifier: Apache-2.0
#ifndef BENCH_HOST_H
#define BENCH_HOST_H

#include "Files.h"
#include <tslauth/Paths.h>

namespace bench::Host {

namespace Paths = tessel::authentication::Paths;

inline constexpr char Policy[] = "#%PAM-1.0\n\n"
                                 "account\trequired\t/lib/security/$ISA/pam_access.so\t\n"
                                 "account\trequired\t/lib/security/$ISA/pam_unix.so\t\n\n"
                                 "auth\trequired\t/lib/security/$ISA/pam_access.so\t\n"
                                 "auth\tsufficient\t/lib/security/$ISA/pam_unix.so\t\n"
                                 "auth\trequired\t/lib/security/$ISA/pam_deny.so\t\n\n"
                                 "password\trequired\t/lib/security/$ISA/pam_deny.so\t\n\n"
                                 "session\trequired\t/lib/security/$ISA/pam_permit.so\t\n\n";
inline constexpr char Services[] = "passwd: files\ngroup: files\nshadow: files\nhosts: files dns\n";
inline constexpr char NoStore[] = "remote-authentication-store = \"None\"\n";

/// A host whose store is "None", with this folder's provider configured. Only in a node.
inline void MakeInactive() {
    WriteFile(Paths::PAMPolicy, Policy);
    WriteFile(Paths::NSSConfiguration, Services);
    WriteFile(Paths::AuthenticationConfiguration, NoStore);
}

inline void ConfigureProvider() {
    WriteFile(Paths::ProviderConfiguration, "provider = \"bench\"\n");
}

} // namespace bench::Host

#endif
