// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

/// The administrator's smb.conf(5), and the file of this provider's own that it includes. Text in,
/// text out: no file is opened here.
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

/// Whether one of the [global] sections of `text` includes the file `path`.
bool HasSambaInclude(std::string_view text, std::string_view path);

/// `text` with `path` included behind everything that [global] sets, so that it overrules all of
/// it; `text` itself where it is included already. WithoutSambaInclude() gives back the very bytes
/// of a `text` that did not include it.
std::string WithSambaInclude(std::string_view text, std::string_view path);

/// `text` without the lines that WithSambaInclude() added, wherever in [global] they have got to
/// since, and without any other line there that includes `path`.
std::string WithoutSambaInclude(std::string_view text, std::string_view path);

/// What the provider's own file says about the domain.
struct SambaDomain {
    std::string realm;       ///< in capitals
    std::string workgroup;   ///< the domain's NetBIOS name
    std::string netbiosName; ///< the host's
    /// Asked before any other domain controller, in this order.
    std::vector<std::string> preferredControllers;
};

/// The provider's own file, for a host whose administrator sets `administrator`. What the provider
/// depends on always stands in it; what is a matter of taste only where the administrator leaves it
/// open. The numbers of users and groups come from ranges that overlap with none of his. Comments may
/// be put in front of the text and nothing behind it: its last line may have to be without a line end.
/// @throws Failure TSLAUTH_PROVIDER_INVALID_PARAMETER for a value with a control character
std::string SambaDomainText(SambaDomain const& domain, SambaSettings const& administrator);

/// A whole smb.conf for a tool that must not touch the host: every directory that Samba keeps
/// anything in is below `directory`. It includes nothing.
/// @throws Failure as above
std::string StagedSambaDomainText(SambaDomain const& domain, std::string const& directory);

/// The directories that StagedSambaDomainText() names, `directory` itself not among them. Parents
/// come first. The first is the one that secrets.tdb lies in.
std::vector<std::string> StagingDirectories(std::string const& directory);

/// Reads the provider's own file back. Empty where it lacks the realm or the workgroup.
std::optional<SambaDomain> ReadSambaDomain(std::string_view text);

/// The provider's own file with other preferred controllers and nothing else changed, so that users
/// keep their numbers whatever the administrator has changed since the join.
/// @throws Failure as above
std::string WithPreferredControllers(std::string_view text,
                                     std::vector<std::string> const& controllers);

} // namespace tessel::winbind
