// SPDX-License-Identifier: Apache-2.0
#include <tslauth/CAMThumbprintStore.h>

namespace tessel::authentication {

CAMThumbprintStore::CAMThumbprintStore(std::string const& path) : Configuration(path) {}

CAMThumbprintStore::CAMThumbprintStore(std::string const& path, OnReadError onReadError)
    : Configuration(path, onReadError) {}

CAMThumbprintStore::~CAMThumbprintStore() = default;

std::string CAMThumbprintStore::LookupThumbprint(std::string const& server) const {
    const_iterator const found = find(server);
    return found == end() ? std::string() : found->second;
}

void CAMThumbprintStore::ImportThumbprint(std::string const& thumbprint,
                                          std::string const& server) {
    auto const [entry, isNew] = emplace(server, thumbprint);
    if (!isNew) {
        if (entry->second == thumbprint) {
            return;
        }
        entry->second = thumbprint;
    }
    Write();
}

} // namespace tessel::authentication
