// SPDX-License-Identifier: Apache-2.0
/// Reads any bytes as a key-value file, writes it back and reads it again. The oracle is a second
/// reader, written slowly, which shares nothing with the library's.
#include "Expect.h"

#include <tslauth/Configuration.h>
#include <tslauth/Exceptions.h>

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <map>
#include <sstream>
#include <string>

using namespace tessel::authentication;

namespace {

using Map = std::map<std::string, std::string>;

/// The folder of this run's file, removed with it at the end.
class Folder {
public:
    Folder() {
        std::string name = (std::filesystem::temp_directory_path() / "fuzz-XXXXXX").string();
        if (mkdtemp(name.data()) == nullptr) {
            std::abort();
        }
        _path = name;
    }
    Folder(Folder const&) = delete;
    Folder& operator=(Folder const&) = delete;
    ~Folder() {
        std::error_code ignored; // nobody is left to be told
        std::filesystem::remove_all(_path, ignored);
    }

    std::string File() const {
        return (_path / "file.conf").string();
    }

private:
    std::filesystem::path _path;
};

std::string Describe(Map const& map) {
    std::string out;
    for (auto const& [key, value] : map) {
        out.append("{").append(key).append("} = {").append(value).append("}\n");
    }
    return out;
}

std::string CleanSlowly(std::string const& field, int line) {
    auto first = field.find_first_not_of(" \t");
    if (first == std::string::npos) {
        return field;
    }
    auto last = field.find_last_not_of(" \t");
    bool const quote = field[first] == '"' || field[first] == '\'';
    if (first == last && quote) {
        throw ConfigurationError("Error parsing configuration at line " + std::to_string(line) +
                                 ": invalid quoting");
    }
    if (first != last && quote && field[first] == field[last]) {
        ++first;
        --last;
    }
    return field.substr(first, last + 1 - first);
}

Map ReadSlowly(std::string const& text) {
    Map map;
    std::istringstream in(text);
    int number = 0;
    for (std::string line; std::getline(in, line);) {
        ++number;
        if (line.find_first_not_of(" \t") == std::string::npos) {
            continue;
        }
        auto const delimiter = line.find('=');
        if (delimiter == std::string::npos) {
            throw ConfigurationError("Error parsing configuration on line " +
                                     std::to_string(number) + ": no delimiter found");
        }
        auto const value = CleanSlowly(line.substr(delimiter + 1), number);
        auto const key = CleanSlowly(line.substr(0, delimiter), number);
        map.insert({key, value});
    }
    return map;
}

template <typename Reader> std::string Outcome(Reader const& reader) {
    try {
        return Describe(reader());
    } catch (ConfigurationError const& error) {
        return std::string("ConfigurationError: ") + error.what();
    }
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(std::uint8_t const* data, std::size_t size) {
    static Folder const folder;
    std::string const path = folder.File();
    std::string const text(reinterpret_cast<char const*>(data), size);
    std::ofstream(path, std::ios::binary) << text;

    auto const read = Outcome([&] { return Configuration(path); });
    Expect("the reader follows the format", read, Outcome([&] { return ReadSlowly(text); }));
    if (read.compare(0, 18, "ConfigurationError") == 0) {
        return 0;
    }

    Configuration const configuration(path);
    configuration.Write();
    std::ifstream in(path, std::ios::binary);
    std::string const written{std::istreambuf_iterator<char>(in), {}};
    std::string expected;
    bool plain = true;
    for (auto const& [key, value] : configuration) {
        expected.append(key).append(" = \"").append(value).append("\"\n");
        // A key is written without quotes, so one that was quoted for its blanks or quotes does not
        // come back as itself.
        plain = plain && !key.empty() &&
                std::string(" \t'\"").find(key.front()) == std::string::npos && key.back() != ' ' &&
                key.back() != '\t';
    }
    Expect("what is written is one line a key", written, expected);
    auto const again = Outcome([&] { return Configuration(path); });
    Expect("what was written is read by the same rules", again,
           Outcome([&] { return ReadSlowly(written); }));
    if (plain) {
        Expect("what was written reads as before", again, read);
    }
    return 0;
}
