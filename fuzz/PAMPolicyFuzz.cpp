// SPDX-License-Identifier: Apache-2.0
/// Reads any bytes as a PAM policy. The oracle is a second reader, written slowly and line by line
/// with string streams, which shares nothing with the library's.
#include "Expect.h"

#include "../tests/unit/SystemFileModels.h"
#include "ProviderModules.h"

#include <cstddef>
#include <cstdint>
#include <sstream>
#include <string>

using namespace SystemFileModels;
using namespace tessel::authentication::ProviderModules;

namespace {

void ReadSlowly(std::istream& in, PAMPolicy& policy) {
    for (;;) {
        in >> std::ws;
        if (in.peek() == '#') {
            std::string comment;
            std::getline(in, comment);
            continue;
        }
        std::string word;
        if (!(in >> word)) {
            return;
        }
        PAMFacility const facility(word);
        PAMControl control;
        if (in >> word) {
            std::string text = word;
            if (text.front() == '[') {
                while (text.back() != ']' && in >> word) {
                    text += " " + word;
                }
            }
            control = text;
        }
        std::string module;
        in >> module;
        PAMEntry entry(control, module);
        std::string line;
        std::getline(in, line);
        std::istringstream words(line);
        while (words >> word) {
            entry.parameters().push_back(word);
        }
        policy[facility].push_back(entry);
    }
}

std::string Slowly(std::string const& text) {
    PAM::Model policy;
    std::istringstream in(text);
    auto const failure = Failure([&] { ReadSlowly(in, policy); });
    return Describe(policy) + failure;
}

/// Whether a line was cut short by the end of the input: it has no module, and read again it takes
/// one from the line that is printed after it.
bool IsCutShort(PAMPolicy const& policy) {
    for (auto const& [facility, stack] : policy.Stacks()) {
        for (auto const& entry : stack) {
            if (entry.module().empty()) {
                return true;
            }
        }
    }
    return false;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size) {
    std::string const text(reinterpret_cast<char const*>(data), size);
    auto const read = FromText<PAM>(text);
    Expect("the reader of texts follows the format", read, Slowly(text));
    Expect("the reader of streams agrees with the reader of texts", FromStream<PAM>(text), read);

    auto const printed = Normalised<PAM>(text);
    Expect("both printers agree", NormalisedThroughStreams<PAM>(text), printed);

    PAM::Model policy;
    auto const failure = Failure([&] { ReadPolicy(text, policy); });
    if (!failure.empty()) {
        Expect("a failure to read is a failure to normalise", printed, failure);
        return 0;
    }
    if (IsCutShort(policy)) {
        if (printed.compare(0, 2, "#%") == 0) {
            Expect("a line cut short is read on", FromText<PAM>(printed), Slowly(printed));
        } else {
            Expect("a line without control is not printed", printed,
                   "InvalidControlException: Invalid Control: ");
        }
        return 0;
    }
    Expect("what was printed reads as before", FromText<PAM>(printed), read);
    Expect("what was normalised stays", Normalised<PAM>(printed), printed);

    auto const entry = PAMEntryFor("pam_x.so", {"a"});
    auto const inserted = EditedPAMPolicy(text, Edit::insert, entry);
    Expect("inserting twice is inserting once", EditedPAMPolicy(inserted, Edit::insert, entry),
           inserted);
    return 0;
}
