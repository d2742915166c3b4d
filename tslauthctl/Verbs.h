// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_VERBS_H
#define TSLAUTHCTL_VERBS_H

#include "Output.h"

#include <string>

/// One function a command, each in the file of its name. They report through `output`, say how the
/// process ends, and throw `Failure` or the library's exceptions where they could not do their
/// work.
namespace tessel::tslauthctl {

struct Plan;
struct Refusal;

ExitCode RunStores(Output& output);
ExitCode RunStatus(Output& output);
ExitCode RunPlan(std::string const& store, Output& output);
ExitCode RunActivate(std::string const& store, bool acceptLoss, Output& output);
ExitCode RunPrepare(bool write, bool acceptLoss, Output& output);

/// What `plan` shows of a plan, and `activate` before it refuses: JSON fields "store", "recorded",
/// "files" and "refusal".
void DescribePlan(Plan const& plan, Output& output);

/// Below a refusal that comes from the reader of a system file.
void AddPrepareHint(Refusal const& refusal, Output& output);

} // namespace tessel::tslauthctl

#endif
