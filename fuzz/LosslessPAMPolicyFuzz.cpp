// SPDX-License-Identifier: Apache-2.0
/// Edits any bytes losslessly. The oracle is the model: where it can read the outcome, it has to
/// agree with it; and what was put in must come out without a trace.
#include "Expect.h"

#include "../tests/unit/LosslessEdits.h"

#include <cstddef>
#include <cstdint>
#include <string>

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size) {
    std::string const text(reinterpret_cast<char const*>(data), size);
    std::string broken;
    LosslessEdits::Judge<LosslessEdits::PAM>(text, broken);
    Expect("an edit without loss", broken, "");
    return 0;
}
