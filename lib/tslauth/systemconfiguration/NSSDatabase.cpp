// SPDX-License-Identifier: Apache-2.0
#include <tslauth/systemconfiguration/NSSDatabase.h>

#include "Words.h"

namespace SystemConfiguration {

InvalidDatabaseException::InvalidDatabaseException(std::string const& message)
    : _message(message) {}
InvalidDatabaseException::~InvalidDatabaseException() noexcept = default;

char const* InvalidDatabaseException::what() const noexcept {
    return _message.c_str();
}

NSSDatabase::NSSDatabase(std::string const& word) : _database(Words::ValueOf<NSSDatabase>(word)) {}

NSSDatabase& NSSDatabase::operator=(std::string const& word) {
    return *this = Words::ValueOf<NSSDatabase>(word);
}

NSSDatabase::operator std::string() const {
    return std::string(Words::WordOf<NSSDatabase>(_database));
}

bool NSSDatabase::operator==(std::string const& word) const {
    return _database == Words::ValueOf<NSSDatabase>(word);
}

} // namespace SystemConfiguration
