// SPDX-License-Identifier: Apache-2.0
/// Reads any bytes as a name-service switch file. The oracle is a second reader, written slowly
/// with string streams that are asked for their position and moved, which shares nothing with the
/// library's. It alone decides what becomes of services around bracketed lists.
#include "Expect.h"

#include "../tests/unit/SystemFileModels.h"
#include "ProviderModules.h"

#include <cstddef>
#include <cstdint>
#include <sstream>
#include <stdexcept>
#include <string>

using namespace SystemFileModels;
using namespace tessel::authentication::ProviderModules;

namespace {

void ReadLineSlowly(std::string const& line, NSSConfiguration& configuration) {
    std::istringstream in(line);
    std::string word;
    in >> word;
    NSSDatabase const database(word.substr(0, word.empty() ? 0 : word.size() - 1));
    while (in >> word) {
        NSSService service(word);
        auto const told = in.tellg();
        if (told != std::istringstream::pos_type(-1)) {
            auto const position = static_cast<std::size_t>(std::streamoff(told));
            if (position + 1 == line.size()) {
                throw std::out_of_range("basic_string::at");
            }
            std::size_t const close = line.find(']', position + 1);
            if (line[position + 1] == '[' && close != std::string::npos) {
                std::istringstream list(line.substr(position + 2, close - position - 2));
                for (std::string parameter; list >> parameter;) {
                    service.parameters().push_back(parameter);
                }
            }
            if (close != std::string::npos) {
                in.seekg(static_cast<std::streamoff>(close + position + 1));
            }
        }
        configuration[database].push_back(service);
    }
}

void ReadSlowly(std::istream& in, NSSConfiguration& configuration) {
    for (std::string line; std::getline(in, line);) {
        auto const start = line.find_first_not_of(" \t\r\n");
        if (start != std::string::npos && line[0] != '#') {
            ReadLineSlowly(line.substr(start), configuration);
        }
    }
}

std::string Slowly(std::string const& text) {
    NSSConfiguration configuration;
    std::istringstream in(text);
    auto const failure = Failure([&] { ReadSlowly(in, configuration); });
    return Describe(configuration) + failure;
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size) {
    std::string const text(reinterpret_cast<char const*>(data), size);
    auto const read = FromText<NSS>(text);
    Expect("the reader of texts follows the format", read, Slowly(text));
    Expect("the reader of streams agrees with the reader of texts", FromStream<NSS>(text), read);

    auto const printed = Normalised<NSS>(text);
    Expect("both printers agree", NormalisedThroughStreams<NSS>(text), printed);

    NSSConfiguration configuration;
    auto const failure = Failure([&] { ReadConfiguration(text, configuration); });
    if (!failure.empty()) {
        Expect("a failure to read is a failure to normalise", printed, failure);
        return 0;
    }
    Expect("what was printed is read by the same rules", FromText<NSS>(printed), Slowly(printed));
    if (printed.find(']') != std::string::npos) {
        return 0; // a list moves the reader, so that a second reading may lose more
    }
    Expect("without lists, what was printed reads as before", FromText<NSS>(printed), read);
    Expect("without lists, what was normalised stays", Normalised<NSS>(printed), printed);

    auto const service = NSSServiceFor("x", {});
    auto const inserted = EditedNSSConfiguration(text, Edit::insert, service);
    Expect("inserting twice is inserting once",
           EditedNSSConfiguration(inserted, Edit::insert, service), inserted);
    return 0;
}
