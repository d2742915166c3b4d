// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>

/// The process's heap, where the checker has one of its own: every piece knows its beginning, its
/// size and whether it was released. In a build with sanitizers it is the sanitizers', who end the
/// process at what is wrong.
namespace tessel::providercheck::Allocator {

enum class Fault { ReleasedTwice, NeverAllocated, Overrun, WrittenAfterRelease };

/// Is called on the thread that releases, or that looks; allocates nothing.
typedef void (*Report)(Fault fault, void const* memory, std::size_t size);

/// Whether this heap is the checker's own.
bool Watches();

/// From here on faults are told, and what is released is kept, so that it can be looked at again.
void Watch(Report report);

/// Looks at all that was released since `Watch`.
void LookAtReleased();

/// How many pieces are allocated now.
std::size_t Live();

/// The size of the piece that begins at `memory`; 0 where none is known to begin there.
std::size_t SizeOf(void const* memory);

} // namespace tessel::providercheck::Allocator
