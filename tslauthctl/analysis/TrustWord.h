// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_TRUSTWORD_H
#define TSLAUTHCTL_TRUSTWORD_H

namespace tessel::tslauthctl {

/// The state of a host's trust as a word, the same for every provider; "other" for a number that is
/// a provider's own.
char const* TrustWord(int state) noexcept;

} // namespace tessel::tslauthctl

#endif
