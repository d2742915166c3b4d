// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_CONFIGURATION_H
#define TSLAUTH_CONFIGURATION_H

#include "Export.h"

#include <map>
#include <string>
#include <utility>

namespace tessel {
namespace authentication {

/// What becomes of an error that comes when a file is open and read in part.
enum class OnReadError {
    /// It ends the text there, as it does with an input stream.
    EndQuietly,
    /// It is reported. For files that are written back: an error must not shorten them.
    Throw,
};

/// One of the library's own configuration files: `key = "value"` lines, read into a sorted map.
///
/// The format has no comments, no escapes and no sections. A line is split at its first "="; blanks
/// (space and tab) around the key and the value are dropped, then one pair of equal quotes around
/// each. Lines of nothing but blanks are skipped. Of two lines for one key the first counts.
///
/// It is not a parser for other programs' files, and not a cache: it is the file as it was when the
/// object was made. Keys are added, removed and listed through the map; `operator[]` only finds.
/// A value of one thread at a time; reading and writing block as long as the file system does.
class TSLAUTH_EXPORT Configuration : public std::map<std::string, std::string> {
public:
    /// Reads the file. An error after it was opened ends the reading and is not reported.
    /// @throws IOError "Unable to open '" + path + "': " + the system's text; "Cannot read '" +
    ///         path + "': it is not a regular file" for a pipe or a device, neither of which is
    ///         waited for
    /// @throws ConfigurationError as `GetKeyValuePair`, at the first bad line; lines are counted
    ///         from 1, the skipped ones included
    explicit Configuration(std::string const& path);

    /// The same, with a choice for who writes the file back.
    /// @throws as above; with `OnReadError::Throw` also IOError "Cannot read '" + path + "': " +
    ///         the reason, for an error after the file was opened and for a folder
    Configuration(std::string const& path, OnReadError onReadError);
    Configuration(Configuration const&) = default;
    Configuration& operator=(Configuration const&) = default;

    /// Writes nothing.
    virtual ~Configuration();

    /// Replaces the file by one line for each key, in the order of the map: the old file stays or
    /// the new one is there, whole and durable. Nothing is escaped: a value that holds a line feed
    /// does not come back.
    /// @throws IOError if the file cannot be written or moved into place; the old one is untouched
    /// @throws FilePermissionError if it was replaced but may have the wrong permissions
    virtual void Write() const;

    /// The value of a key that exists; unlike the map's own operator, it adds none.
    /// @throws InvalidKeyException "The specified key '" + key + "' was not found in this
    ///         configuration"
    std::string& operator[](std::string const& key);
    std::string const& operator[](std::string const& key) const;

private:
    std::string _path;
};

/// The key and the value of one line that is not blank.
/// @param lineNumber stands in the message of an exception, and is used for nothing else
/// @throws ConfigurationError "Error parsing configuration on line " + number + ": no delimiter
///         found", or "Error parsing configuration at line " + number + ": invalid quoting" for a
///         key or value that is one lone quote
TSLAUTH_EXPORT std::pair<std::string, std::string> GetKeyValuePair(std::string const& line,
                                                                   int lineNumber);

} // namespace authentication
} // namespace tessel

#endif
