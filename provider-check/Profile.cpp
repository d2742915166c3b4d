// SPDX-License-Identifier: Apache-2.0
#include "Profile.h"

#include <tslauth/Configuration.h>
#include <tslauth/Exceptions.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <fstream>
#include <sstream>

namespace tessel::providercheck {

namespace {

using authentication::ConfigurationError;
using authentication::IOError;

unsigned Number(std::string const& key, std::string const& text) {
    char* end = nullptr;
    errno = 0;
    unsigned long const number = std::strtoul(text.c_str(), &end, 0);
    if (text.empty() || text[0] == '-' || *end != '\0' || errno != 0 || number > 0xffffffffU) {
        throw ConfigurationError("'" + text + "' is no number for '" + key + "'");
    }
    return static_cast<unsigned>(number);
}

std::string FirstLine(std::string const& path) {
    std::ifstream file(path);
    std::string line;
    if (!std::getline(file, line)) {
        throw IOError("Cannot read '" + path + "': " + std::strerror(errno));
    }
    return line;
}

} // namespace

Profile::Profile(std::string const& path) {
    for (auto const& [key, value] :
         authentication::Configuration(path, authentication::OnReadError::Throw)) {
        if (key == "seconds") {
            seconds = Number(key, value);
        } else if (key == "codes") {
            std::istringstream words(value);
            for (std::string word; words >> word;) {
                codes.insert(Number(key, word));
            }
        } else if (key == "host-may-change") {
            if (value != "yes" && value != "no") {
                throw ConfigurationError("'" + key + "' is \"yes\" or \"no\"");
            }
            hostMayChange = value == "yes";
        } else if (key == "domain") {
            domain = value;
        } else if (key == "user") {
            user = value;
        } else if (key == "password-file") {
            password = FirstLine(value);
        } else if (key == "account") {
            account = value;
        } else if (key == "server") {
            server = value;
        } else if (key == "thumbprint") {
            thumbprint = value;
        } else {
            throw ConfigurationError("'" + key + "' is no key of a profile");
        }
    }
    if (seconds == 0) {
        throw ConfigurationError("'seconds' is at least 1");
    }
}

} // namespace tessel::providercheck
