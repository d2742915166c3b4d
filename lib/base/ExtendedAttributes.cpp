// SPDX-License-Identifier: Apache-2.0
#include "ExtendedAttributes.h"

#include <cerrno>
#include <string_view>
#include <sys/types.h>
#include <sys/xattr.h>
#include <utility>
#include <vector>

namespace tessel::base {

namespace {

/// What a call like flistxattr(2) gives, however long it is.
template <typename Call> std::optional<std::string> Whole(Call call) {
    for (;;) {
        ssize_t const size = call(nullptr, 0);
        if (size < 0) {
            return std::nullopt;
        }
        if (size == 0) {
            return std::string();
        }
        std::string text(static_cast<std::size_t>(size), '\0');
        ssize_t const got = call(text.data(), text.size());
        if (got >= 0) {
            text.resize(static_cast<std::size_t>(got));
            return text;
        }
        if (errno != ERANGE) { // otherwise it has grown in between
            return std::nullopt;
        }
    }
}

/// Sums and signatures of the contents (evm(7), ima_policy) do not fit any other file.
bool IsComputed(std::string_view name) {
    return name == "security.ima" || name == "security.evm";
}

/// @return nothing where the file system fails; none where it knows no such attributes
std::optional<std::vector<std::string>> Names(int file) {
    auto const list =
        Whole([file](char* buffer, std::size_t size) { return ::flistxattr(file, buffer, size); });
    std::vector<std::string> names;
    if (!list) {
        return errno == ENOTSUP ? std::make_optional(names) : std::nullopt;
    }
    for (std::size_t start = 0; start < list->size();) {
        std::string name = list->c_str() + start;
        start += name.size() + 1;
        if (!IsComputed(name)) {
            names.push_back(std::move(name));
        }
    }
    return names;
}

} // namespace

std::optional<ExtendedAttributes> ReadExtendedAttributes(int file) {
    auto const names = Names(file);
    if (!names) {
        return std::nullopt;
    }
    ExtendedAttributes attributes;
    for (std::string const& name : *names) {
        auto value = Whole([file, &name](char* buffer, std::size_t size) {
            return ::fgetxattr(file, name.c_str(), buffer, size);
        });
        if (!value) {
            return std::nullopt;
        }
        attributes.emplace(name, std::move(*value));
    }
    return attributes;
}

bool SetExtendedAttributes(int file, ExtendedAttributes const& wanted) {
    auto const present = Names(file);
    if (!present) {
        return false;
    }
    // What the folder gave to the new file, a default access control list for one.
    for (std::string const& name : *present) {
        if (wanted.count(name) == 0 && ::fremovexattr(file, name.c_str()) != 0 &&
            errno != ENODATA) {
            return false;
        }
    }
    for (auto const& [name, value] : wanted) {
        if (::fsetxattr(file, name.c_str(), value.data(), value.size(), 0) != 0) {
            return false;
        }
    }
    return true;
}

} // namespace tessel::base
