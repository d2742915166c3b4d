// SPDX-License-Identifier: Apache-2.0
#ifndef BENCH_STREAMCODE_H
#define BENCH_STREAMCODE_H

#include "Floor.h"

#include <algorithm>
#include <fstream>
#include <list>
#include <map>
#include <ostream>
#include <sstream>
#include <string>
#include <vector>

/// The edits as one would write them first: `std::getline`, a string stream a line, `operator<<`.
namespace StreamCode {

/// The steps of `Floor::Replace`, with a stream for the contents.
template <typename Print> void Replace(std::string const& path, Print print) {
    std::string name = path + ".XXXXXX";
    ::close(Floor::Checked(::mkstemp(name.data())));
    std::ofstream file(name);
    print(file);
    file.close();
    int const again = Floor::Checked(::open(name.c_str(), O_WRONLY | O_CLOEXEC));
    Floor::Checked(::fsync(again));
    ::close(again);
    struct stat old = {};
    Floor::Checked(::stat(path.c_str(), &old));
    Floor::Checked(::chmod(name.c_str(), old.st_mode & 07777));
    Floor::Checked(::rename(name.c_str(), path.c_str()));
    std::string const folder = path.substr(0, path.rfind('/') + 1);
    int const opened = Floor::Checked(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    Floor::Checked(::fsync(opened));
    ::close(opened);
}

struct Entry {
    std::string control;
    std::string module;
    std::list<std::string> parameters;

    bool operator==(Entry const& other) const {
        return control == other.control && module == other.module && parameters == other.parameters;
    }
};

inline void EditPAMPolicy(std::string const& source, std::string const& target,
                          Entry const& inserted) {
    std::map<std::string, std::vector<Entry>> stacks;
    std::ifstream in(source);
    for (std::string line; std::getline(in, line);) {
        std::istringstream words(line);
        std::string facility;
        if (!(words >> facility) || facility[0] == '#') {
            continue;
        }
        Entry entry;
        words >> entry.control;
        for (std::string more;
             entry.control[0] == '[' && entry.control.back() != ']' && words >> more;) {
            entry.control += ' ' + more;
        }
        words >> entry.module;
        for (std::string parameter; words >> parameter;) {
            entry.parameters.push_back(parameter);
        }
        stacks[facility].push_back(entry);
    }
    for (char const* const facility : {"auth", "account"}) {
        std::vector<Entry>& stack = stacks[facility];
        auto place = stack.begin();
        bool there = false;
        for (auto entry = stack.begin(); entry != stack.end(); ++entry) {
            there = there || *entry == inserted;
            if (place == stack.begin() && entry->module == "/lib/security/$ISA/pam_access.so") {
                place = entry + 1;
            }
        }
        if (!there) {
            stack.insert(place, inserted);
        }
    }
    Replace(target, [&](std::ostream& out) {
        out << "#%PAM-1.0\n\n";
        for (auto const& [facility, stack] : stacks) {
            for (Entry const& entry : stack) {
                out << facility << '\t' << entry.control << '\t' << entry.module << '\t';
                for (std::string const& parameter : entry.parameters) {
                    out << parameter << ' ';
                }
                out << '\n';
            }
            out << '\n';
        }
    });
}

inline void EditNSSConfiguration(std::string const& source, std::string const& target,
                                 std::string const& inserted) {
    std::map<std::string, std::vector<std::string>> databases;
    std::ifstream in(source);
    for (std::string line; std::getline(in, line);) {
        std::istringstream words(line);
        std::string database;
        if (!(words >> database) || database[0] == '#') {
            continue;
        }
        database.pop_back();
        for (std::string service; words >> service;) {
            databases[database].push_back(service);
        }
    }
    for (char const* const database : {"passwd", "group", "shadow"}) {
        std::vector<std::string>& services = databases[database];
        if (std::find(services.begin(), services.end(), inserted) == services.end()) {
            services.insert(services.begin(), inserted);
        }
    }
    Replace(target, [&](std::ostream& out) {
        for (std::string_view const word : Floor::Databases) {
            auto const found = databases.find(std::string(word));
            if (found == databases.end()) {
                continue;
            }
            out << word << ':';
            for (std::string const& service : found->second) {
                out << ' ' << service;
            }
            out << '\n';
        }
    });
}

} // namespace StreamCode

#endif
