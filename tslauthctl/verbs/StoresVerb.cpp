// SPDX-License-Identifier: Apache-2.0
#include "analysis/Failures.h"
#include "analysis/KnownStores.h"
#include "verbs/Verbs.h"

#include <tslauth/AuthenticationConfiguration.h>
#include <tslauth/Exceptions.h>

namespace tessel::tslauthctl {

ExitCode RunStores(Console& console) {
    auto& document = console.Document();
    document["recorded"] = nullptr;
    auto& stores = document["stores"] = nlohmann::json::array();
    std::string recorded;
    auto code = ExitCode::done;
    try {
        recorded = authentication::RecordedStore();
        document["recorded"] = recorded;
    } catch (authentication::Exception const& e) {
        console.Error(Refused(e));
        code = ExitCode::refused;
    }
    for (auto const& name : Stores().GetRegisteredStores()) {
        bool const active = code == ExitCode::done && name == recorded;
        stores.push_back({{"name", name}, {"active", active}});
        console.Line((active ? "* " : "  ") + name);
    }
    return code;
}

} // namespace tessel::tslauthctl
