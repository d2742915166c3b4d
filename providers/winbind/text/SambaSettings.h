// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace tessel::winbind {

/// What the [global] sections of the administrator's texts set. Read as Samba reads: names without
/// regard to case and blanks, "\" at the end of a line goes on with the next, parameters before the
/// first section are global, "[globals]" is another name of "[global]", the last value wins. A text
/// that Samba refuses is read as far as it makes sense.
class SambaSettings {
public:
    /// Numbers from `first` to `last`, both included.
    struct Range {
        std::uint64_t first;
        std::uint64_t last;
    };

    SambaSettings() = default;
    explicit SambaSettings(std::string_view text);

    /// Adds the text of another file, as if it had been included at the end of [global].
    void Read(std::string_view text);

    bool Sets(std::string_view name) const;
    std::optional<std::string> Value(std::string_view name) const;

    /// Whether any `idmap config DOMAIN : ...` is set; for "*" also the older forms, such as
    /// `idmap uid`. Without regard to case.
    bool SetsIdmapOf(std::string_view domain) const;

    /// The ranges of all domains that have one in a form that can be read.
    std::vector<Range> IdmapRanges() const;

    /// The files that [global] includes, as written there (macros such as %h not replaced), in
    /// order.
    std::vector<std::string> const& Includes() const {
        return _includes;
    }

private:
    std::map<std::string, std::string> _values; ///< by name in lower case, without blanks
    std::vector<std::string> _includes;
};

} // namespace tessel::winbind
