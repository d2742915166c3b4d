// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

/// The fixed paths and numbers of the CAM provider, so that they cannot drift.
namespace tessel::winbind::cam::Paths {

/// The one-time code that the service's administrator issued for this host.
inline constexpr char OneTimeCode[] = "/etc/tessel/tslauth/winbind-cam.code";

/// The authorities that may sign a service's certificate. Where there is no such file, the
/// system's.
inline constexpr char Authorities[] = "/etc/tessel/tslauth/winbind-cam-ca.pem";

/// Which installation this is: made anew where an image becomes a host.
inline constexpr char Machine[] = "/etc/machine-id";

/// Where tslauth-cam-service listens: a server is known by its address alone.
inline constexpr std::uint16_t Port = 8989;

} // namespace tessel::winbind::cam::Paths
