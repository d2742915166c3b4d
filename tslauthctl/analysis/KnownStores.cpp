// SPDX-License-Identifier: Apache-2.0
#include "analysis/KnownStores.h"

#include "terminal/Console.h"

#include <algorithm>

namespace tessel::tslauthctl {

authentication::AuthenticationStoreFactory& Stores() {
    static authentication::AuthenticationStoreFactory factory;
    return factory;
}

bool IsKnownStore(std::string const& name) {
    auto const known = Stores().GetRegisteredStores();
    return std::find(known.begin(), known.end(), name) != known.end();
}

void RequireStore(std::string const& name) {
    if (IsKnownStore(name)) {
        return;
    }
    auto const known = Stores().GetRegisteredStores();
    std::string message = "Unknown store '" + name + "'. Known are: ";
    for (auto const& store : known) {
        message += (&store == &known.front() ? "'" : ", '") + store + "'";
    }
    throw Failure(ExitCode::usage, message);
}

} // namespace tessel::tslauthctl
