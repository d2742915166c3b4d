// SPDX-License-Identifier: Apache-2.0
#include "host/SecretFile.h"

#include "Failure.h"

#include <cerrno>
#include <cstring>
#include <string>
#include <sys/mman.h>
#include <sys/types.h>
#include <system_error>
#include <unistd.h>

namespace tessel::winbind {

SecretFile::SecretFile(std::initializer_list<std::string_view> pieces)
    : _descriptor(::memfd_create("secret", MFD_CLOEXEC)) {
    for (std::string_view const piece : pieces) {
        _size += piece.size();
    }
    bool done = _descriptor >= 0 && ::ftruncate(_descriptor, static_cast<off_t>(_size)) == 0;
    if (done && _size > 0) {
        void* const memory =
            ::mmap(nullptr, _size, PROT_READ | PROT_WRITE, MAP_SHARED, _descriptor, 0);
        done = memory != MAP_FAILED;
        if (done) {
            _memory = static_cast<char*>(memory);
        }
    }
    if (!done) {
        int const error = errno;
        if (_descriptor >= 0) {
            (void)::close(_descriptor); // nothing was written to it
        }
        throw Failure(TSLAUTH_PROVIDER_NOT_ENOUGH_MEMORY,
                      "cannot make a file in memory: " + std::generic_category().message(error));
    }
    if (!_memory) {
        return;
    }
    // Best effort: the limit of locked memory is the host process's own.
    (void)::mlock(_memory, _size);
    (void)::madvise(_memory, _size, MADV_DONTDUMP);
    char* end = _memory;
    for (std::string_view const piece : pieces) {
        if (!piece.empty()) {
            std::memcpy(end, piece.data(), piece.size());
            end += piece.size();
        }
    }
}

SecretFile::~SecretFile() {
    if (_memory) {
        ::explicit_bzero(_memory, _size);
        (void)::munmap(_memory, _size); // can only fail for a range that is none
    }
    (void)::close(_descriptor); // memory has nothing to lose at the end
}

} // namespace tessel::winbind
