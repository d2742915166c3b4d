// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_TRUSTSTATE_H
#define TSLAUTH_TRUSTSTATE_H

#include <cstdint>

namespace tessel {
namespace authentication {

/// A domain's trust state as the provider reports it; what the values mean is the provider's
/// business. The store itself produces two: 0 where the provider does not answer the question, and
/// 7 where it reports that what the trusted domains are read from does not exist.
struct TrustState {
    std::int32_t value;
};

} // namespace authentication
} // namespace tessel

#endif
