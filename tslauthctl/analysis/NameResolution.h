// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTHCTL_NAMERESOLUTION_H
#define TSLAUTHCTL_NAMERESOLUTION_H

#include <optional>
#include <string>
#include <string_view>
#include <vector>

/// The files that a join edits so that controllers accept the host's name.
namespace tessel::tslauthctl {

/// The names that a hosts file gives to `address` beside those that `kept` begins with up to their
/// first "." and `kept` itself, each once, in the order of the file. A join drops them: the entry
/// of the management address then names the host alone.
std::vector<std::string> OtherNames(std::string_view hosts, std::string const& address,
                                    std::string const& hostName);

/// The hosts file and the resolver's configuration as they were when this was made.
class NameResolution {
public:
    NameResolution();

    /// The names that a join would drop from the hosts file. Empty where that cannot be told.
    std::vector<std::string> NamesToBeDropped() const;

    /// Puts back what has changed since.
    /// @return the paths of what was put back
    /// @throws Failure where a file cannot be put back, naming it
    std::vector<std::string> PutBack() const;

private:
    struct File {
        std::string path;
        std::optional<std::string> text;
    };
    std::vector<File> _files;
};

} // namespace tessel::tslauthctl

#endif
