// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_LIBRARYHANDLE_H
#define TSLAUTH_LIBRARYHANDLE_H

#include <memory>

namespace tessel {
namespace authentication {

/// A provider's library, loaded as long as its handle lives; empty where there is none. It is a
/// part of the adapters, and nothing that a caller needs.
typedef std::unique_ptr<void, void (*)(void*)> LibraryHandle;

} // namespace authentication
} // namespace tessel

#endif
