// SPDX-License-Identifier: Apache-2.0
#include "host/PreferredControllers.h"

#include "Failure.h"
#include "Paths.h"
#include "host/HostFile.h"

#include <algorithm>
#include <cerrno>
#include <sstream>
#include <sys/stat.h>
#include <tslauth/AtomicFileStream.h>
#include <tslauth/Configuration.h>
#include <tslauth/Exception.h>
#include <utility>

namespace tessel::winbind {

namespace {

constexpr std::size_t longestName = 253;

void MakeFile(std::string const& path) {
    std::string const folder = path.substr(0, path.rfind('/'));
    if (::mkdir(folder.c_str(), 0755) != 0 && errno != EEXIST) {
        ThrowSystemFailure("cannot make the folder '" + folder + "'", errno);
    }
    authentication::AtomicFileStream stream(path.c_str(), std::ios::out);
    stream.Sync();
    stream.Commit();
    if (::chmod(path.c_str(), 0644) != 0) { // what replaces it later takes that over
        ThrowSystemFailure("cannot give '" + path + "' its mode", errno);
    }
}

} // namespace

bool IsControllerName(std::string_view name) {
    static constexpr std::string_view allowed = "abcdefghijklmnopqrstuvwxyz"
                                                "ABCDEFGHIJKLMNOPQRSTUVWXYZ"
                                                "0123456789.-_:";
    return !name.empty() && name.size() <= longestName && name.front() != '-' &&
           name.find_first_not_of(allowed) == std::string_view::npos;
}

PreferredControllers::PreferredControllers(std::string path) : _path(std::move(path)) {}

std::vector<std::string> PreferredControllers::Read() const {
    if (!FileExists(_path)) {
        return {};
    }
    try {
        authentication::Configuration const file(_path);
        auto const found = file.find(Paths::PreferredControllersKey);
        std::istringstream words(found == file.end() ? std::string() : found->second);
        std::vector<std::string> controllers;
        for (std::string word; words >> word;) {
            if (IsControllerName(word)) { // an administrator may have edited it
                controllers.push_back(word);
            }
        }
        return controllers;
    } catch (authentication::Exception const& e) {
        throw Failure(TSLAUTH_WINBIND_SEE_SYSTEM_LOG, "'" + _path + "': " + e.what());
    }
}

void PreferredControllers::Write(std::vector<std::string> const& controllers) const {
    std::string value;
    for (std::string const& controller : controllers) {
        if (!IsControllerName(controller)) {
            throw Failure(TSLAUTH_PROVIDER_INVALID_COMPUTER_NAME,
                          "'" + controller + "' is not the name of a controller");
        }
        value += (value.empty() ? "" : " ") + controller;
    }
    try {
        if (!FileExists(_path)) {
            if (controllers.empty()) {
                return;
            }
            MakeFile(_path);
        }
        authentication::Configuration file(_path);
        file.insert({Paths::PreferredControllersKey, value}).first->second = value;
        file.Write();
    } catch (authentication::Exception const& e) {
        throw Failure(TSLAUTH_WINBIND_SEE_SYSTEM_LOG, "'" + _path + "': " + e.what());
    }
}

} // namespace tessel::winbind
