// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_HOSTLOCK_H
#define TSLAUTH_HOSTLOCK_H

#include "Export.h"

namespace tessel {
namespace authentication {

/// Keeps two changes of the host apart. Whoever activates stores, joins, parts or edits the
/// library's files holds it meanwhile, in whatever process; `tslauthctl` does. The stores
/// themselves take no lock.
///
/// Advice among those who take it, and for root: it stands at "/run/tslauthctl.lock", where nobody
/// else may put a file. The kernel lets go of it when the process ends, however it ends; the file
/// stays. Two objects of one process keep each other out as those of two processes do. One object
/// is used by one thread at a time.
class TSLAUTH_EXPORT HostLock {
public:
    /// Opens the lock, and does not take it.
    /// @throws IOError "Cannot lock '/run/tslauthctl.lock': " + the reason, also where what stands
    ///     there is not a file of root's
    HostLock();
    HostLock(HostLock const&) = delete;
    HostLock& operator=(HostLock const&) = delete;
    /// Lets go of it.
    ~HostLock();

    /// Takes it, however long another holds it.
    /// @throws IOError
    void Lock();

    /// Takes it, unless another holds it for longer than that.
    /// @param seconds to wait at most; 0 does not wait
    /// @return whether it has been taken
    /// @throws IOError
    bool TryLock(int seconds = 0);

private:
    int _descriptor;
};

} // namespace authentication
} // namespace tessel

#endif
