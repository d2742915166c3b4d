// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMCONFIGURATION_NSSCONFIGURATION_H
#define TSLAUTH_SYSTEMCONFIGURATION_NSSCONFIGURATION_H

#include "../Export.h"
#include "NSSDatabase.h"
#include "NSSService.h"

#include <deque>
#include <iosfwd>
#include <map>

namespace SystemConfiguration {

/// The name-service switch file: for each lookup database the services that answer it, in the order
/// in which they are asked.
///
/// It holds the services and nothing else: comments, blank lines and spacing are not kept. It does
/// not carry every file without loss; `operator>>` says what it drops and what it refuses. The
/// configuration does not know its path and opens no file.
///
/// A value; one object is used by one thread at a time.
class TSLAUTH_EXPORT NSSConfiguration {
public:
    /// The services of a database. Where there are none yet, an empty queue is made, which the
    /// writer then shows as a line without services: "no service answers", which is not the same as
    /// no line. The reference stays valid as long as the configuration does.
    std::deque<NSSService>& operator[](NSSDatabase database);

    /// The databases there are, in the order in which they are written. Unlike `operator[]`,
    /// looking does not make one.
    std::map<NSSDatabase, std::deque<NSSService>> const& Databases() const noexcept {
        return _databases;
    }

private:
    std::map<NSSDatabase, std::deque<NSSService>> _databases;
};

/// Reads a file up to the end of the stream, which is in the fail state then, and appends its
/// services to those there are.
///
/// A "#" makes a comment in the first column only. A list in brackets is understood directly behind
/// one separator; the services behind it on the same line are skipped or read from the middle. A
/// line that names a database and no service leaves no trace.
/// @throws InvalidDatabaseException for a line of an unknown database, an indented comment among
/// them
/// @throws std::out_of_range "basic_string::at" for a line whose last word is followed by exactly
/// one character, such as a blank or a carriage return
/// In both cases the services read before stay in the configuration.
TSLAUTH_EXPORT std::istream& operator>>(std::istream& in, NSSConfiguration& configuration);

/// Writes one line a database, and nothing else: its word, ":", and a space before each service.
/// @throws InvalidDatabaseException where there are services, or an empty queue, for
/// `NSSDatabase::none`
TSLAUTH_EXPORT std::ostream& operator<<(std::ostream& out, NSSConfiguration const& configuration);

} // namespace SystemConfiguration

#endif
