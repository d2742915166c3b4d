// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMCONFIGURATION_NSSDATABASE_H
#define TSLAUTH_SYSTEMCONFIGURATION_NSSDATABASE_H

#include "../Export.h"

#include <exception>
#include <string>

namespace SystemConfiguration {

/// A text that is no database of the name-service switch, or a database without a text form. As
/// with `InvalidControlException`, the remedy is to repair the file.
class TSLAUTH_EXPORT InvalidDatabaseException : public std::exception {
public:
    /// @param message the complete message: "Invalid Database: " followed by the refused text
    explicit InvalidDatabaseException(std::string const& message);

    InvalidDatabaseException(InvalidDatabaseException const&) = default;
    InvalidDatabaseException& operator=(InvalidDatabaseException const&) = default;
    ~InvalidDatabaseException() noexcept override;

    /// The complete message. Valid as long as the object is.
    char const* what() const noexcept override;

private:
    std::string _message;
};

/// A lookup database of the name-service switch: one of fifteen words. Others that a system may
/// know, such as `gshadow` or `initgroups`, are refused.
///
/// A value; one object is used by one thread at a time.
class TSLAUTH_EXPORT NSSDatabase {
public:
    /// The numbers are part of the interface, and their order is the order in which a file is
    /// written. `none` is a database that was never set: it has no word.
    enum Database {
        none = 0,
        passwd = 1,
        group = 2,
        shadow = 3,
        hosts = 4,
        netmasks = 5,
        networks = 6,
        protocols = 7,
        services = 8,
        ethers = 9,
        rpc = 10,
        netgroup = 11,
        bootparams = 12,
        publickey = 13,
        automount = 14,
        aliases = 15
    };

    NSSDatabase() noexcept : _database(none) {}
    NSSDatabase(Database database) noexcept : _database(database) {}

    /// @param word one of the fifteen words, in lower case and without a colon
    /// @throws InvalidDatabaseException "Invalid Database: " + `word`
    NSSDatabase(std::string const& word);

    /// As the constructor of the same argument. On a failure the database stays as it was.
    /// @throws InvalidDatabaseException
    NSSDatabase& operator=(std::string const& word);

    NSSDatabase& operator=(Database database) noexcept {
        _database = database;
        return *this;
    }

    operator Database() const noexcept {
        return _database;
    }

    /// The word.
    /// @throws InvalidDatabaseException "Invalid Database: " for `none`
    operator std::string() const;

    bool operator==(NSSDatabase const& other) const noexcept {
        return _database == other._database;
    }
    bool operator!=(NSSDatabase const& other) const noexcept {
        return _database != other._database;
    }
    bool operator==(Database database) const noexcept {
        return _database == database;
    }
    bool operator!=(Database database) const noexcept {
        return _database != database;
    }

    /// @throws InvalidDatabaseException where `word` is unknown; the answer is not false then
    bool operator==(std::string const& word) const;
    bool operator!=(std::string const& word) const {
        return !(*this == word);
    }

private:
    Database _database;
};

inline bool operator==(NSSDatabase::Database left, NSSDatabase const& right) noexcept {
    return right == left;
}
inline bool operator!=(NSSDatabase::Database left, NSSDatabase const& right) noexcept {
    return right != left;
}
inline bool operator==(std::string const& left, NSSDatabase const& right) {
    return right == left;
}
inline bool operator!=(std::string const& left, NSSDatabase const& right) {
    return right != left;
}

} // namespace SystemConfiguration

#endif
