// SPDX-License-Identifier: Apache-2.0
#include "Factory.h"

#include <memory>
#include <mutex>

namespace tessel::tslauth_c {

authentication::AuthenticationStoreFactory& Factory() {
    using authentication::AuthenticationStoreFactory;
    static std::mutex lock;
    std::lock_guard<std::mutex> const guard(lock);
    if (AuthenticationStoreFactory::Instance() == nullptr) {
        (void)std::make_unique<AuthenticationStoreFactory>().release(); // it registers itself
    }
    return *AuthenticationStoreFactory::Instance();
}

} // namespace tessel::tslauth_c
