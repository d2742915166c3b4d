// SPDX-License-Identifier: Apache-2.0
#include "Host.h"
#include "Verbs.h"

#include <tslauth/Exceptions.h>

namespace tessel::tslauthctl {

ExitCode RunStores(Output& output) {
    auto& document = output.Document();
    document["recorded"] = nullptr;
    auto& stores = document["stores"] = nlohmann::json::array();
    std::string recorded;
    auto code = ExitCode::done;
    try {
        recorded = RecordedStore();
        document["recorded"] = recorded;
    } catch (authentication::Exception const& e) {
        output.Error(Refused(e));
        code = ExitCode::refused;
    }
    for (auto const& name : Stores().GetRegisteredStores()) {
        bool const active = code == ExitCode::done && name == recorded;
        stores.push_back({{"name", name}, {"active", active}});
        output.Line((active ? "* " : "  ") + name);
    }
    return code;
}

} // namespace tessel::tslauthctl
