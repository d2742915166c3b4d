// SPDX-License-Identifier: Apache-2.0
#ifndef BENCH_EDIT_H
#define BENCH_EDIT_H

#include "Cases.h"
#include "Files.h"

#include <functional>
#include <string>
#include <vector>

namespace bench {

/// One of the two system files that an activation edits, for the cases that they share.
struct SystemFile {
    std::string title;
    std::function<std::string(int lines)> text;
    /// Each reads the file `source` and replaces `target` by what an activation makes of it.
    std::function<void(std::string const&source, std::string const&target)> ours, floor, streams;
    /// The same through Augeas with one lens, on the file of the model's name below `root`.
    std::string name;
    std::function<void(std::string const& root)> augeas;
};

void AddEditCases(Table& table, Places const& places, SystemFile const& file);

} // namespace bench

#endif
