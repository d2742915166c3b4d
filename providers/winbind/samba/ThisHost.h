// SPDX-License-Identifier: Apache-2.0
#pragma once

namespace tessel::winbind {

class Host;

/// The host that this process runs on. Any thread may use it, as long as the process lives.
Host const& ThisHost();

} // namespace tessel::winbind
