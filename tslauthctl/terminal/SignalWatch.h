// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_SIGNALWATCH_H
#define TSLAUTHCTL_SIGNALWATCH_H

#include <csignal>
#include <map>

namespace tessel::tslauthctl {

/// While one exists, signals that would end or stop the process are remembered and wake whoever
/// polls `Descriptor()`, so that something can be tidied up first. A signal that was ignored
/// before, as under nohup(1), stays ignored. At most one exists at a time.
class SignalWatch {
public:
    enum class Signals {
        /// What a person at a terminal or a service manager ends a process with.
        ending,
        /// Every signal that a process can catch and that does something if it does not, and the
        /// one that continues it.
        all
    };

    /// @throws Failure
    explicit SignalWatch(Signals signals);
    SignalWatch(SignalWatch const&) = delete;
    SignalWatch& operator=(SignalWatch const&) = delete;
    ~SignalWatch();

    /// Ends the watch: signals have the effect again that they had before. Nothing is lost in
    /// between.
    /// @return `Signal()`, which is for the caller to raise again
    int Stop() noexcept;

    /// Readable, for poll(2), once there is a signal.
    int Descriptor() const noexcept;

    /// The signal that came, 0 as long as none did.
    int Signal() const noexcept;

private:
    std::map<int, struct sigaction> _before;
};

} // namespace tessel::tslauthctl

#endif
