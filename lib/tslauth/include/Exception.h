// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_EXCEPTION_H
#define TSLAUTH_EXCEPTION_H

#include "Export.h"

#include <exception>
#include <string>

namespace tessel {
namespace authentication {

/// Base of every failure that the library reports. No operation returns an error code.
///
/// An exception is a value: a 32-bit code (0 where there is none) and the complete message. It can
/// be copied onto the heap and thrown again with its own class, which is how a worker thread hands
/// its failure to the thread that waits for it.
///
/// The classes to catch stand in `Exceptions.h`, grouped by what a caller can do about them.
/// Copying and destroying are safe from any thread; one object is used by one thread at a time.
class TSLAUTH_EXPORT Exception : public std::exception {
public:
    /// The coded form: the message becomes "Exception 0x" + eight lower-case hexadecimal digits of
    /// `code` + ": " + `text`. Only the low 32 bits of `code` count, so that a provider's negative
    /// `int` reads the same in a 32-bit and in a 64-bit process.
    /// @param code a system error code, in the numbering of the Windows system error codes
    Exception(unsigned long code, std::string const& text);

    /// The plain form: code 0, and `text` is the message as it stands.
    explicit Exception(std::string const& text);

    Exception(Exception const&) = default;
    Exception& operator=(Exception const&) = default;
    ~Exception() noexcept override;

    /// The complete message. Valid as long as the object is.
    char const* what() const noexcept override;

    /// A copy on the heap, of this object's own class. The caller owns it and deletes it.
    /// @throws std::bad_alloc
    virtual Exception* Clone() const;

    /// Throws a copy of this object, typed as its own class. Never returns.
    [[noreturn]] virtual void Throw() const;

    /// The code, at most 0xffffffff; 0 for an exception of the plain form.
    unsigned long Code() const noexcept;

private:
    unsigned long _code;
    std::string _message;
};

} // namespace authentication
} // namespace tessel

#endif
