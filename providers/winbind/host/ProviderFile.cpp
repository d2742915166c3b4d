// SPDX-License-Identifier: Apache-2.0
#include "host/ProviderFile.h"

#include "Failure.h"
#include "host/HostFile.h"
#include "tslauth_winbind_provider.h"

#include <tslauth/Configuration.h>
#include <tslauth/Exception.h>

namespace tessel::winbind {

ProviderOptions ReadProviderOptions(std::string const& path) {
    if (!FileExists(path)) {
        return {};
    }
    try {
        return OptionsIn(authentication::Configuration(path));
    } catch (authentication::Exception const& e) {
        throw Failure(TSLAUTH_WINBIND_SEE_SYSTEM_LOG, "'" + path + "': " + e.what());
    } catch (Failure const& e) {
        throw Failure(e.Code(), "'" + path + "': " + e.what());
    }
}

} // namespace tessel::winbind
