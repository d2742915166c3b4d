// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_SETUPARCHIVE_H
#define TSLAUTHCTL_SETUPARCHIVE_H

#include "setup/SetupRecord.h"

#include <optional>
#include <string>
#include <vector>

/// Where the record of a host that was set up is kept, as an administrator can read it: one
/// document, and the files below "before" and "after" under their own paths.
namespace tessel::tslauthctl {

/// Nothing where the host was not set up.
/// @throws Failure where it cannot be read or understood
std::optional<SetupRecord> ReadSetupRecord();

/// To be called before the host is changed: what is in the record then can be undone.
/// @throws Failure
void WriteSetupRecord(SetupRecord const& record);

/// Writes what has become of one file, where the record has it.
/// @throws Failure
void RecordChange(std::string const& path, std::string const& text);

void RemoveSetupRecord() noexcept;

/// Where the text that a file had before is kept, and what has become of it.
std::string KeptOriginal(std::string const& path);
std::string SetUpCopy(std::string const& path);

/// Every path that the record may have.
std::vector<std::string> SetupRecordPaths();

} // namespace tessel::tslauthctl

#endif
