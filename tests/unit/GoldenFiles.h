// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_UNIT_GOLDENFILES_H
#define TESTS_UNIT_GOLDENFILES_H

#include "SystemFileModels.h"

#include <gtest/gtest.h>

#include <cstddef>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <vector>

namespace SystemFileModels {

inline std::string Contents(std::filesystem::path const& path) {
    std::ifstream in(path, std::ios::binary);
    if (!in) {
        throw std::runtime_error("cannot read " + path.string());
    }
    return {std::istreambuf_iterator<char>(in), {}};
}

/// The texts that there are golden files for.
template <typename Kind> std::vector<std::filesystem::path> GoldenTexts() {
    std::vector<std::filesystem::path> paths;
    auto const folder = std::filesystem::path(TESTS_DATA_DIR) / Kind::folder;
    for (auto const& file : std::filesystem::directory_iterator(folder)) {
        if (file.path().extension() == ".in") {
            paths.push_back(file.path());
        }
    }
    return paths;
}

/// Each `NAME.in` below the model's folder must read and print as `NAME.out` says, or fail as
/// `NAME.error` says. Both ways of reading, and both of printing.
template <typename Kind> void ExpectGoldenFiles(std::size_t atLeast) {
    auto const texts = GoldenTexts<Kind>();
    for (auto path : texts) {
        SCOPED_TRACE(path.filename());
        auto const text = Contents(path);
        bool const fails = std::filesystem::exists(path.replace_extension(".error"));
        auto expected = Contents(fails ? path : path.replace_extension(".out"));
        if (fails && !expected.empty() && expected.back() == '\n') {
            expected.pop_back();
        }
        EXPECT_EQ(Normalised<Kind>(text), expected);
        EXPECT_EQ(NormalisedThroughStreams<Kind>(text), expected);
        EXPECT_EQ(FromText<Kind>(text), FromStream<Kind>(text));
    }
    EXPECT_GE(texts.size(), atLeast);
}

} // namespace SystemFileModels

#endif
