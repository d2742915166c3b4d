// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_UNIT_WINBIND_GOLDENTEXT_H
#define TESTS_UNIT_WINBIND_GOLDENTEXT_H

#include <gtest/gtest.h>

#include <cstddef>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <vector>

inline std::filesystem::path GoldenPath(std::string const& name) {
    return std::filesystem::path(TESTS_DATA_DIR) / "winbind" / name;
}

inline std::string GoldenText(std::string const& name) {
    std::ifstream in(GoldenPath(name), std::ios::binary);
    if (!in) {
        throw std::runtime_error("cannot read " + name);
    }
    return {std::istreambuf_iterator<char>(in), {}};
}

/// The files of a folder with an extension, as GoldenText() takes them.
inline std::vector<std::string> GoldenNames(std::string const& folder,
                                            std::string const& extension) {
    std::vector<std::string> names;
    for (auto const& file : std::filesystem::directory_iterator(GoldenPath(folder))) {
        if (file.path().extension() == extension) {
            names.push_back(folder + '/' + file.path().filename().string());
        }
    }
    return names;
}

/// Each `NAME.in` of the folder must become `NAME.out`, and that `NAME.in` again.
template <typename Has, typename With, typename Without>
void ExpectGoldenEdits(std::string const& folder, std::size_t atLeast, Has const& has,
                       With const& with, Without const& without) {
    auto const names = GoldenNames(folder, ".in");
    for (auto const& name : names) {
        SCOPED_TRACE(name);
        std::string const original = GoldenText(name);
        std::string const edited = GoldenText(name.substr(0, name.size() - 3) + ".out");
        EXPECT_FALSE(has(original));
        EXPECT_TRUE(has(edited));
        EXPECT_EQ(with(original), edited);
        EXPECT_EQ(with(edited), edited);
        EXPECT_EQ(without(edited), original);
        EXPECT_EQ(without(original), original);
    }
    EXPECT_GE(names.size(), atLeast);
}

#endif
