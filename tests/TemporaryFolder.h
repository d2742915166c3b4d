// SPDX-License-Identifier: Apache-2.0
#ifndef TESTS_TEMPORARYFOLDER_H
#define TESTS_TEMPORARYFOLDER_H

#include <algorithm>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <sys/stat.h>
#include <sys/types.h>
#include <system_error>
#include <vector>

/// A folder of a test's own, removed at its end with everything in it.
class TemporaryFolder {
public:
    TemporaryFolder()
        : _path((std::filesystem::temp_directory_path() / "tslauth.XXXXXX").string()) {
        if (!::mkdtemp(_path.data())) {
            throw std::runtime_error("cannot create " + _path);
        }
    }
    TemporaryFolder(TemporaryFolder const&) = delete;
    TemporaryFolder& operator=(TemporaryFolder const&) = delete;
    ~TemporaryFolder() {
        std::error_code ignored; // what cannot be removed is left to the system's own cleaning
        std::filesystem::remove_all(_path, ignored);
    }

    std::string const& Path() const {
        return _path;
    }
    std::string operator/(std::string const& name) const {
        return _path + "/" + name;
    }

    /// The names in the folder, in order.
    std::vector<std::string> Names() const {
        std::vector<std::string> names;
        for (auto const& entry : std::filesystem::directory_iterator(_path)) {
            names.push_back(entry.path().filename().string());
        }
        std::sort(names.begin(), names.end());
        return names;
    }

private:
    std::string _path;
};

inline std::string Contents(std::string const& path) {
    std::ifstream file(path, std::ios::binary);
    if (!file) {
        throw std::runtime_error("cannot open " + path);
    }
    return {std::istreambuf_iterator<char>(file), std::istreambuf_iterator<char>()};
}

inline void SetContents(std::string const& path, std::string const& text) {
    std::ofstream file(path, std::ios::binary | std::ios::trunc);
    file << text << std::flush;
    if (!file) {
        throw std::runtime_error("cannot write " + path);
    }
}

/// The mode bits of a file, 07777.
inline mode_t ModeOf(std::string const& path) {
    struct stat status = {};
    if (::stat(path.c_str(), &status) != 0) {
        throw std::runtime_error("cannot stat " + path);
    }
    return status.st_mode & 07777;
}

#endif
