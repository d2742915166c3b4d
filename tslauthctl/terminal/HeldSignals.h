// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_HELDSIGNALS_H
#define TSLAUTHCTL_HELDSIGNALS_H

/// Signals that end a process (INT, TERM, HUP) wait while the host is changed: between two files it
/// would be neither what it was nor what it is to become. To be called by the main thread, while no
/// other one runs that would take them.
namespace tessel::tslauthctl {

/// From now on they wait, in this process and in programs that it starts.
void HoldSignals() noexcept;

/// Those that came take effect, which usually is the end of the process.
void LetSignalsThrough() noexcept;

} // namespace tessel::tslauthctl

#endif
