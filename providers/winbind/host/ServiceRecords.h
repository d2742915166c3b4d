// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <string>
#include <string_view>
#include <vector>

/// The controllers that DNS names for a domain.
namespace tessel::winbind::ServiceRecords {

/// The controllers of `domain` in the order of DNS (priority, then weight). No state of the C
/// library's resolver is shared, and no answer is waited for longer than 8 seconds.
/// @throws Failure 1355 where DNS knows no such domain or cannot be asked, 10060 where it is silent
std::vector<std::string> Ask(std::string const& domain);

/// The names that an answer of DNS to a question for SRV records holds, in their order. Names that
/// are no host's are left out: they would become arguments of a program.
/// @throws Failure 1355 for what is no such answer
std::vector<std::string> Read(std::string_view answer);

} // namespace tessel::winbind::ServiceRecords
