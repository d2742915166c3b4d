// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_VERBS_H
#define TSLAUTHCTL_VERBS_H

#include "Await.h"
#include "Output.h"
#include "Password.h"

#include <optional>
#include <string>
#include <vector>

/// One function a command, each in the file of its name or in that of its kind. They report through
/// `output`, say how the process ends, and throw `Failure` or the library's exceptions where they
/// could not do their work.
namespace tessel::tslauthctl {

struct Plan;
struct Refusal;

ExitCode RunStores(Output& output);
ExitCode RunStatus(Output& output);
ExitCode RunPlan(std::string const& store, Output& output);
ExitCode RunActivate(std::string const& store, bool acceptLoss, Output& output);
ExitCode RunPrepare(bool write, bool acceptLoss, Output& output);

/// In whose name a host is joined or parted.
struct AccountArguments {
    std::optional<std::string> user;
    PasswordSource password;
};

struct JoinArguments {
    /// "DOMAIN" or "DOMAIN/UNIT"; empty for a join through a CAM server.
    std::string domain;
    std::string server;
    std::string unit;
    AccountArguments account;
    bool skipHostnameCheck = false;
};

ExitCode RunJoin(JoinArguments const& arguments, Limit limit, Output& output);
ExitCode RunPart(AccountArguments const& arguments, Limit limit, Output& output);
ExitCode RunInfo(Limit limit, Output& output);
/// @param domain empty for the host's own
ExitCode RunDC(std::string const& domain, Limit limit, Output& output);
ExitCode RunPrincipal(std::string const& domain, Limit limit, Output& output);
ExitCode RunCanonical(std::string const& name, Limit limit, Output& output);
ExitCode RunPreferredDCs(Limit limit, Output& output);
ExitCode RunSetPreferredDCs(std::vector<std::string> const& controllers, Limit limit,
                            Output& output);
ExitCode RunCAMImport(std::string const& server, std::string const& file, Limit limit,
                      Output& output);
ExitCode RunCAMList(Output& output);
ExitCode RunCAMDomain(std::string const& server, Limit limit, Output& output);

/// What `plan` shows of a plan, and `activate` before it refuses: JSON fields "store", "recorded",
/// "files" and "refusal".
void DescribePlan(Plan const& plan, Output& output);

/// Below a refusal that comes from the reader of a system file.
void AddPrepareHint(Refusal const& refusal, Output& output);

} // namespace tessel::tslauthctl

#endif
