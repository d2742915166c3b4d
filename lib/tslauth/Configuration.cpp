// SPDX-License-Identifier: Apache-2.0
#include <tslauth/Configuration.h>

#include "ConfigurationText.h"
#include "SystemFile.h"

#include <tslauth/AtomicFileStream.h>
#include <tslauth/Exceptions.h>

namespace tessel::authentication {

Configuration::Configuration(std::string const& path)
    : Configuration(path, OnReadError::EndQuietly) {}

Configuration::Configuration(std::string const& path, OnReadError onReadError) : _path(path) {
    ReadAssignments(ReadFile(path, "Unable to open", onReadError), *this);
}

Configuration::~Configuration() = default;

void Configuration::Write() const {
    AtomicFileStream stream(_path.c_str(), std::ios::out);
    // Each line is flushed, so each is put together first: that makes it one system call, whatever
    // its length.
    std::string line;
    for (auto const& [key, value] : *this) {
        AssignLine(line, {key, value});
        auto const size = static_cast<std::streamsize>(line.size());
        if (stream.rdbuf()->sputn(line.data(), size) != size || stream.rdbuf()->pubsync() != 0) {
            stream.setstate(std::ios::badbit);
            // At once, while the error number is still that of the failure; `Sync` reports it.
            break;
        }
    }
    stream.Sync();
    stream.Commit();
}

std::string& Configuration::operator[](std::string const& key) {
    iterator const found = find(key);
    if (found == end()) {
        ThrowMissingKey(key);
    }
    return found->second;
}

std::string const& Configuration::operator[](std::string const& key) const {
    const_iterator const found = find(key);
    if (found == end()) {
        ThrowMissingKey(key);
    }
    return found->second;
}

std::pair<std::string, std::string> GetKeyValuePair(std::string const& line, int lineNumber) {
    base::Assignment const assignment = SplitLine(line, lineNumber);
    return {std::string(assignment.key), std::string(assignment.value)};
}

} // namespace tessel::authentication
