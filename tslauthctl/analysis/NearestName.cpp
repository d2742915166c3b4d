// SPDX-License-Identifier: Apache-2.0
#include "analysis/NearestName.h"

#include <base/AsciiText.h>

#include <algorithm>

namespace tessel::tslauthctl {

namespace {

/// The number of letters to leave out, put in, change, or swap with their neighbours.
std::size_t Distance(std::string const& left, std::string const& right) {
    std::vector<std::vector<std::size_t>> table(left.size() + 1,
                                                std::vector<std::size_t>(right.size() + 1));
    for (std::size_t i = 0; i <= left.size(); ++i) {
        for (std::size_t j = 0; j <= right.size(); ++j) {
            if (i == 0 || j == 0) {
                table[i][j] = i + j;
                continue;
            }
            std::size_t const change = left[i - 1] == right[j - 1] ? 0 : 1;
            table[i][j] =
                std::min({table[i - 1][j] + 1, table[i][j - 1] + 1, table[i - 1][j - 1] + change});
            if (i > 1 && j > 1 && left[i - 1] == right[j - 2] && left[i - 2] == right[j - 1]) {
                table[i][j] = std::min(table[i][j], table[i - 2][j - 2] + 1);
            }
        }
    }
    return table[left.size()][right.size()];
}

} // namespace

std::string NearestName(std::string const& word, std::vector<std::string> const& names) {
    auto const sought = base::AsciiText::Lower(word);
    std::string nearest;
    // A third of the letters may be wrong; of the shortest words, one.
    auto least = std::max<std::size_t>(word.size() / 3, 1) + 1;
    for (auto const& name : names) {
        bool const begins = sought.size() > 1 && base::AsciiText::StartsWith(name, sought);
        auto const distance = begins ? 1 : Distance(sought, name);
        if (distance < least) {
            least = distance;
            nearest = name;
        }
    }
    return nearest;
}

} // namespace tessel::tslauthctl
