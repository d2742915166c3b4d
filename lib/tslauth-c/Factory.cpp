// SPDX-License-Identifier: Apache-2.0
#include "Factory.h"

#include <memory>
#include <mutex>

namespace tessel::tslauth_c {

authentication::AuthenticationStoreFactory& Factory() {
    using authentication::AuthenticationStoreFactory;
    static std::mutex lock;
    std::lock_guard<std::mutex> const guard(lock);
    if (AuthenticationStoreFactory* const found = AuthenticationStoreFactory::Instance()) {
        return *found;
    }
    // It registers itself, and is never destroyed: a job may still run when the process ends.
    return *std::make_unique<AuthenticationStoreFactory>().release();
}

} // namespace tessel::tslauth_c
