// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_AGREEMENT_H
#define TSLAUTHCTL_AGREEMENT_H

#include <tslauth/ActivationPlan.h>

#include <string>
#include <string_view>
#include <vector>

/// Whether the system files agree with the recorded store. No file is opened here.
namespace tessel::tslauthctl {

/// `unknown`: the provider or the file cannot be read, so that it cannot be told.
enum class Agreement { inStep, partly, notAtAll, unknown };

/// "in-step", "partly", "not-at-all", "unknown"
char const* Word(Agreement agreement);

/// One facility or database, and whether the provider stands in it.
struct Part {
    std::string name;
    Agreement agreement;
};

/// `wanted` says whether the recorded store wants the provider's entry there.
std::vector<Part> PAMParts(std::string_view text, SystemConfiguration::PAMEntry const& entry,
                           bool wanted);
std::vector<Part> NSSParts(std::string_view text, SystemConfiguration::NSSService const& service,
                           bool wanted);

/// The parts of the files, where nothing can be told.
std::vector<Part> UnknownPAMParts();
std::vector<Part> UnknownNSSParts();

/// In step if all are, not at all if none is, unknown if that cannot be told of one of them.
Agreement Together(std::vector<Part> const& parts);

} // namespace tessel::tslauthctl

#endif
