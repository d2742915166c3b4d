// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <vector>

namespace tessel::winbind {

/// Whether `name` is a host's DNS name or an address: of letters, digits, ".", "-", "_" and ":",
/// and nothing that a program would take for an option.
bool IsControllerName(std::string_view name);

/// The controllers to ask first, in a file of the library's format that no join or part touches.
class PreferredControllers {
public:
    explicit PreferredControllers(std::string path);

    /// None where there is no file.
    /// @throws Failure
    std::vector<std::string> Read() const;

    /// Replaces them. Other keys of the file stay; a new file can be read by everybody.
    /// @throws Failure 1210 for a name that is none, and the file is as it was
    void Write(std::vector<std::string> const& controllers) const;

private:
    std::string _path;
};

} // namespace tessel::winbind
