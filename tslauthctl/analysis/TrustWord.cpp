// SPDX-License-Identifier: Apache-2.0
#include "analysis/TrustWord.h"

#include <tslauth/tslauth_provider.h>

namespace tessel::tslauthctl {

char const* TrustWord(int state) noexcept {
    switch (state) {
    case TSLAUTH_PROVIDER_TRUST_IN_ORDER:
        return "in-order";
    case TSLAUTH_PROVIDER_TRUST_SECRET_REFUSED:
        return "secret-refused";
    case TSLAUTH_PROVIDER_TRUST_NO_CONTROLLER:
        return "no-controller";
    case TSLAUTH_PROVIDER_TRUST_SERVICE_NOT_RUNNING:
        return "service-not-running";
    case TSLAUTH_PROVIDER_TRUST_SERVICE_NOT_ANSWERING:
        return "service-not-answering";
    case TSLAUTH_PROVIDER_TRUST_UNKNOWN:
        return "unknown";
    case TSLAUTH_PROVIDER_TRUST_CLOCKS_APART:
        return "clocks-apart";
    case TSLAUTH_PROVIDER_TRUST_NOT_JOINED:
        return "not-joined";
    default:
        return "other";
    }
}

} // namespace tessel::tslauthctl
