// SPDX-License-Identifier: Apache-2.0
#include <tslauth/systemconfiguration/PAMFacility.h>

#include "Words.h"

#include <istream>
#include <ostream>

namespace SystemConfiguration {

InvalidFacilityException::InvalidFacilityException(std::string const& message)
    : _message(message) {}
InvalidFacilityException::~InvalidFacilityException() noexcept = default;

char const* InvalidFacilityException::what() const noexcept {
    return _message.c_str();
}

PAMFacility::PAMFacility(std::string const& word) : _facility(Words::ValueOf<PAMFacility>(word)) {}

PAMFacility& PAMFacility::operator=(std::string const& word) {
    return *this = Words::ValueOf<PAMFacility>(word);
}

PAMFacility::operator std::string() const {
    return std::string(Words::WordOf<PAMFacility>(_facility));
}

bool PAMFacility::operator==(std::string const& word) const {
    return _facility == Words::ValueOf<PAMFacility>(word);
}

std::istream& operator>>(std::istream& in, PAMFacility& facility) {
    std::string word;
    if (in >> word) {
        facility = word;
    }
    return in;
}

std::ostream& operator<<(std::ostream& out, PAMFacility const& facility) {
    return out << Words::WordOf<PAMFacility>(facility);
}

} // namespace SystemConfiguration
