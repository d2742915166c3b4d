// SPDX-License-Identifier: Apache-2.0
#ifndef FUZZ_EXPECT_H
#define FUZZ_EXPECT_H

#include <cstdlib>
#include <iostream>
#include <string>

/// Ends the run, so that the fuzzer keeps the input, when `actual` is not what the oracle says.
inline void Expect(char const* claim, std::string const& actual, std::string const& expected) {
    if (actual != expected) {
        std::cerr << "Broken: " << claim << "\n--- expected\n"
                  << expected << "\n--- actual\n"
                  << actual << "\n---" << std::endl;
        std::abort();
    }
}

#endif
