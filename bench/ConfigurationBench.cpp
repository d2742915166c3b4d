// SPDX-License-Identifier: Apache-2.0
#include "Cases.h"
#include "Files.h"
#include "Floor.h"
#include "StreamCode.h"

#include <tslauth/Configuration.h>

#include <algorithm>
#include <glib.h>
#include <map>
#include <memory>
#include <numeric>
#include <random>
#include <stdexcept>
#include <string>
#include <tuple>
#include <vector>

namespace bench {

namespace {

using tessel::authentication::Configuration;

struct KeyFileOwner {
    void operator()(GKeyFile* file) const {
        ::g_key_file_free(file);
    }
};
using KeyFile = std::unique_ptr<GKeyFile, KeyFileOwner>;

/// What a file is full of.
struct Shape {
    char const* name;
    char const *key, *value; ///< before the number that ends each
};

/// Keys and values that a string holds without memory of its own.
constexpr Shape ShortKeys = {"short keys", "key", "value"};
/// A server and the thumbprint of its certificate: three pieces of memory a key.
constexpr Shape Servers = {"servers", "cam.example.com/server-",
                           "7C:4A:8D:09:CA:37:62:AF:61:E5:95:20:94:3D:"};

/// Made once for each shape, number and order: a million lines take a while.
std::string const& Lines(Shape const& shape, int count, bool shuffled) {
    static std::map<std::tuple<std::string, int, bool>, std::string> made;
    std::string& text = made[{shape.name, count, shuffled}];
    if (text.empty()) {
        std::vector<int> numbers(static_cast<std::size_t>(count));
        std::iota(numbers.begin(), numbers.end(), 0);
        if (shuffled) {
            std::shuffle(numbers.begin(), numbers.end(), std::mt19937(1));
        }
        for (int const number : numbers) {
            std::string const digits = std::to_string(10000000 + number);
            text.append(shape.key).append(digits).append(" = \"");
            text.append(shape.value).append(digits).append("\"\n");
        }
    }
    return text;
}

void CheckLoaded(std::size_t loaded, int count) {
    if (loaded != static_cast<std::size_t>(count)) {
        throw std::runtime_error("not all keys were loaded");
    }
}

KeyFile LoadKeyFile(std::string const& path) {
    KeyFile file(::g_key_file_new());
    if (!::g_key_file_load_from_file(file.get(), path.c_str(), G_KEY_FILE_NONE, nullptr)) {
        throw std::runtime_error("GKeyFile refuses the file");
    }
    return file;
}

void LoadByHand(std::string const& path) {
    Floor::File const file = Floor::Read(path.c_str());
    char const* const end = file.bytes.get() + file.size;
    for (char const* at = file.bytes.get(); at != end;) {
        char const* const delimiter = Floor::Find(at, end, "=");
        benchmark::DoNotOptimize(delimiter);
        at = Floor::Find(delimiter, end, "\n") + 1;
    }
}

void AddLoadCases(Table& table, std::string const& folder, Shape const& shape, int count,
                  bool shuffled) {
    std::string const path = folder + "/load.conf";
    auto const with = [=](char const* header, auto load) {
        return [=](benchmark::State& state) {
            WriteFile(path, header + Lines(shape, count, shuffled));
            Measure(state, [&] { load(path); });
        };
    };
    table.Add(
        "load " + std::string(count < 1000000 ? "1,000" : "1,000,000") + " " + shape.name + " " +
            (shuffled ? "shuffled" : "in order"),
        {Bar::Of::Ratio, 0.5}, Clock::Processor, count < 1000000 ? 15 : 5,
        {{"ours",
          with("",
               [=](std::string const& name) { CheckLoaded(Configuration(name).size(), count); })},
         {"GKeyFile",
          with("[servers]\n",
               [=](std::string const& name) { benchmark::DoNotOptimize(LoadKeyFile(name)); })},
         {"reading by hand", with("", LoadByHand)}});
}

/// A flush a line, as `Configuration` promises it.
template <typename Map> void WriteByHand(std::string const& path, Map const& map) {
    Floor::Replace(path, [&](int file) {
        static constexpr std::string_view middle = " = \"";
        static constexpr std::string_view end = "\"\n";
        std::string line;
        for (auto const& [key, value] : map) {
            line.resize(key.size() + middle.size() + value.size() + end.size());
            char* at = line.data();
            at += key.copy(at, key.size());
            at += middle.copy(at, middle.size());
            at += value.copy(at, value.size());
            end.copy(at, end.size());
            Floor::Checked(static_cast<int>(::write(file, line.data(), line.size())));
        }
    });
}

template <typename Map> void WriteWithStreams(std::string const& path, Map const& map) {
    StreamCode::Replace(path, [&](std::ostream& out) {
        for (auto const& [key, value] : map) {
            out << key << " = \"" << value << '"' << std::endl;
        }
    });
}

void AddWriteCases(Table& table, std::string const& place, std::string const& folder, int count,
                   bool memory) {
    std::string const path = folder + "/write.conf";
    auto const with = [=](auto write) {
        return [=](benchmark::State& state) {
            // Loaded once: what is measured does not change it.
            static std::map<int, std::unique_ptr<Configuration>> loaded;
            auto& configuration = loaded[count];
            WriteFile(path, Lines(Servers, count, false));
            if (configuration == nullptr || observation.active) {
                configuration = std::make_unique<Configuration>(path);
            }
            Measure(state, [&] { write(path, *configuration); });
            ExpectFile(path, Lines(Servers, count, false));
        };
    };
    std::vector<Contender> contenders = {
        {"ours", with([](std::string const&, Configuration const& map) { map.Write(); })},
        {"floor", with(WriteByHand<Configuration>)}};
    if (memory) {
        contenders.push_back({"std::endl", with(WriteWithStreams<Configuration>)});
        contenders.push_back(
            {"GKeyFile", [=](benchmark::State& state) {
                 WriteFile(path, "[servers]\n" + Lines(Servers, count, false));
                 KeyFile const file = LoadKeyFile(path);
                 Measure(state, [&] {
                     if (!::g_key_file_save_to_file(file.get(), path.c_str(), nullptr)) {
                         throw std::runtime_error("GKeyFile cannot write");
                     }
                 });
             }});
    }
    table.Add("write " + std::string(count < 1000000 ? "1,000" : "1,000,000") + " servers, " +
                  place,
              {Bar::Of::Ratio, 1.1}, memory ? Clock::Processor : Clock::Wall,
              count < 1000000 ? 15 : 5, contenders);
}

} // namespace

void AddConfigurationCases(Table& table, Places const& places) {
    for (int const count : {1000, 1000000}) {
        for (bool const shuffled : {false, true}) {
            for (Shape const& shape : {ShortKeys, Servers}) {
                AddLoadCases(table, places.front().second, shape, count, shuffled);
            }
        }
    }
    for (auto const& [place, folder] : places) {
        for (int const count : {1000, 1000000}) {
            AddWriteCases(table, place, folder, count, &place == &places.front().first);
        }
    }
}

} // namespace bench
