// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>

/// The line by which the administrator's smb.conf(5) includes the provider's own file. Text in,
/// text out: no file is opened here.
namespace tessel::winbind {

/// Whether one of the [global] sections of `text` includes the file `path`.
bool HasSambaInclude(std::string_view text, std::string_view path);

/// `text` with `path` included behind everything that [global] sets, so that it overrules all of
/// it; `text` itself where it is included already. WithoutSambaInclude() gives back the very bytes
/// of a `text` that did not include it.
std::string WithSambaInclude(std::string_view text, std::string_view path);

/// `text` without the lines that WithSambaInclude() added, wherever in [global] they have got to
/// since, and without any other line there that includes `path`.
std::string WithoutSambaInclude(std::string_view text, std::string_view path);

} // namespace tessel::winbind
