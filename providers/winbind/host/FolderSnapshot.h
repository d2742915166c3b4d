// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <set>
#include <string>
#include <vector>

namespace tessel::winbind {

/// What is in folders, so that what a program adds to them later can be found and removed. A value.
class FolderSnapshot {
public:
    /// Looks into `folders` and everything below them. One that does not exist holds nothing.
    explicit FolderSnapshot(std::vector<std::string> folders);

    /// Removes what is new since, the folders themselves where they are new and have become empty.
    void RemoveNewFiles() const noexcept;

private:
    std::vector<std::string> _folders;
    std::set<std::string> _paths;
};

} // namespace tessel::winbind
