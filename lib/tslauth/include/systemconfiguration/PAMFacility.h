// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMCONFIGURATION_PAMFACILITY_H
#define TSLAUTH_SYSTEMCONFIGURATION_PAMFACILITY_H

#include "../Export.h"

#include <exception>
#include <iosfwd>
#include <string>

namespace SystemConfiguration {

/// A text that is no management group of PAM, or a facility without a text form. As with
/// `InvalidControlException`, the remedy is to repair the file.
class TSLAUTH_EXPORT InvalidFacilityException : public std::exception {
public:
    /// @param message the complete message: "Invalid Facility: " followed by the refused text
    explicit InvalidFacilityException(std::string const& message);

    InvalidFacilityException(InvalidFacilityException const&) = default;
    InvalidFacilityException& operator=(InvalidFacilityException const&) = default;
    ~InvalidFacilityException() noexcept override;

    /// The complete message. Valid as long as the object is.
    char const* what() const noexcept override;

private:
    std::string _message;
};

/// The management group that a PAM line belongs to. A leading minus, which some files put before
/// the word to mark an optional module, is not understood.
///
/// A value; one object is used by one thread at a time.
class TSLAUTH_EXPORT PAMFacility {
public:
    /// The numbers are part of the interface, and their order is the order in which a policy is
    /// written. `none` is a facility that was never set: it has no word.
    enum Facility { none = 0, account = 1, auth = 2, password = 3, session = 4 };

    PAMFacility() noexcept : _facility(none) {}
    PAMFacility(Facility facility) noexcept : _facility(facility) {}

    /// @param word one of the four words, in lower case
    /// @throws InvalidFacilityException "Invalid Facility: " + `word`
    PAMFacility(std::string const& word);

    /// As the constructor of the same argument. On a failure the facility stays as it was.
    /// @throws InvalidFacilityException
    PAMFacility& operator=(std::string const& word);

    PAMFacility& operator=(Facility facility) noexcept {
        _facility = facility;
        return *this;
    }

    operator Facility() const noexcept {
        return _facility;
    }

    /// The word.
    /// @throws InvalidFacilityException "Invalid Facility: " for `none`
    operator std::string() const;

    bool operator==(PAMFacility const& other) const noexcept {
        return _facility == other._facility;
    }
    bool operator!=(PAMFacility const& other) const noexcept {
        return _facility != other._facility;
    }
    bool operator==(Facility facility) const noexcept {
        return _facility == facility;
    }
    bool operator!=(Facility facility) const noexcept {
        return _facility != facility;
    }

    /// @throws InvalidFacilityException where `word` is unknown; the answer is not false then
    bool operator==(std::string const& word) const;
    bool operator!=(std::string const& word) const {
        return !(*this == word);
    }

private:
    Facility _facility;
};

inline bool operator==(PAMFacility::Facility left, PAMFacility const& right) noexcept {
    return right == left;
}
inline bool operator!=(PAMFacility::Facility left, PAMFacility const& right) noexcept {
    return right != left;
}
inline bool operator==(std::string const& left, PAMFacility const& right) {
    return right == left;
}
inline bool operator!=(std::string const& left, PAMFacility const& right) {
    return right != left;
}

/// Reads one word, skipping white space before it. Where the input ends first, the facility stays
/// as it was and the stream is in the fail state.
/// @throws InvalidFacilityException; the stream has consumed the word
TSLAUTH_EXPORT std::istream& operator>>(std::istream& in, PAMFacility& facility);

/// Writes the word.
/// @throws InvalidFacilityException for `PAMFacility::none`
TSLAUTH_EXPORT std::ostream& operator<<(std::ostream& out, PAMFacility const& facility);

} // namespace SystemConfiguration

#endif
