// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_VERBS_H
#define TSLAUTHCTL_VERBS_H

#include "terminal/Await.h"
#include "terminal/Console.h"
#include "terminal/Password.h"

#include <optional>
#include <string>
#include <vector>

/// One function a command, each in the file of its name or in that of its kind. They report through
/// `console`, say how the process ends, and throw `Failure` or the library's exceptions where they
/// could not do their work.
namespace tessel::tslauthctl {

struct HostPlan;
struct PathState;

ExitCode RunStores(Console& console);
struct StatusArguments {
    /// Also whether the trust checks out, which a controller is asked for.
    bool deep = false;
    Limit limit;
};

ExitCode RunStatus(StatusArguments const& arguments, Console& console);
ExitCode RunPlan(std::string const& store, Console& console);
/// @param confirmWithin seconds, here and below: unless somebody confirms the change by then, it is
///     undone; 0 for never
ExitCode RunActivate(std::string const& store, bool acceptLoss, int confirmWithin,
                     Console& console);
ExitCode RunPlanSetup(std::string const& provider, Console& console);
ExitCode RunSetup(std::string const& provider, int confirmWithin, Console& console);
ExitCode RunPlanUnsetup(Console& console);
ExitCode RunUnsetup(Console& console);

/// Who is permitted or denied to log in.
struct AccessArguments {
    bool denies = false;
    std::vector<std::string> names;
    /// Everybody of the domain.
    bool all = false;
    /// And of the domains that it trusts.
    bool trusted = false;
    /// Also names that nobody knows.
    bool force = false;
    int confirmWithin = 0;
};

ExitCode RunPlanAccess(AccessArguments const& arguments, Limit limit, Console& console);
ExitCode RunAccess(AccessArguments const& arguments, Limit limit, Console& console);
ExitCode RunListAccess(Console& console);

/// What was changed, oldest first.
ExitCode RunHistory(Console& console);
ExitCode RunShowHistory(unsigned number, Console& console);

struct UndoArguments {
    /// 0 for the newest change.
    unsigned number = 0;
    bool dryRun = false;
    /// Also what others have edited since, and the files of a membership.
    bool force = false;
    /// The change that nobody has confirmed in time, if there is one.
    bool unconfirmed = false;
};

/// Keeps the change that is undone by itself otherwise.
ExitCode RunConfirm(Console& console);
ExitCode RunUndo(UndoArguments const& arguments, Console& console);

ExitCode RunPrepare(bool write, bool acceptLoss, Console& console);

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
    bool dryRun = false;
    bool verbose = false;
};

ExitCode RunJoin(JoinArguments const& arguments, Limit limit, Console& console);
ExitCode RunPart(AccountArguments const& arguments, Limit limit, Console& console);
ExitCode RunInfo(Limit limit, Console& console);
/// @param domain empty for the host's own
ExitCode RunDC(std::string const& domain, Limit limit, Console& console);
ExitCode RunPrincipal(std::string const& domain, Limit limit, Console& console);
ExitCode RunCanonical(std::string const& name, Limit limit, Console& console);
ExitCode RunPreferredDCs(Limit limit, Console& console);
ExitCode RunSetPreferredDCs(std::vector<std::string> const& controllers, Console& console);
ExitCode RunCAMImport(std::string const& server, std::string const& file, Limit limit,
                      Console& console);
ExitCode RunCAMList(Console& console);
ExitCode RunCAMDomain(std::string const& server, Limit limit, Console& console);

/// What became of one path, as a diff and in words.
/// @param described gets "path", "before", "after" and "diff"
void DescribePath(std::string const& path, PathState const& before, PathState const& after,
                  nlohmann::json& described, Console& console);

/// What `plan` shows of a plan, and `activate` before it refuses: JSON fields "store", "recorded",
/// "files" and "refusal".
void DescribePlan(HostPlan const& plan, Console& console);

/// Below a plan's refusal: what helps where it is a system file that cannot be edited.
void AddPrepareHint(HostPlan const& plan, Console& console);

} // namespace tessel::tslauthctl

#endif
