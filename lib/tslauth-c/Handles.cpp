// SPDX-License-Identifier: Apache-2.0
#include "Handles.h"

#include <tslauth/Exceptions.h>

#include <cstdlib>
#include <cxxabi.h>
#include <memory>
#include <new>
#include <typeinfo>
#include <utility>

namespace tessel::tslauth_c {

namespace {

using namespace authentication;

/// The class of an object, without its namespace.
std::string ClassOf(std::exception const& exception) {
    std::unique_ptr<char, void (*)(void*)> const readable(
        abi::__cxa_demangle(typeid(exception).name(), nullptr, nullptr, nullptr), &std::free);
    std::string const name = readable == nullptr ? typeid(exception).name() : readable.get();
    std::size_t const place = name.rfind("::");
    return place == std::string::npos ? name : name.substr(place + 2);
}

template <typename... Classes> bool IsOneOf(std::exception const& exception) {
    return ((dynamic_cast<Classes const*>(&exception) != nullptr) || ...);
}

tslauth_error_kind KindOf(std::exception const& exception) {
    if (auto const own = dynamic_cast<Failure const*>(&exception)) {
        return own->Kind();
    }
    if (IsOneOf<std::bad_alloc>(exception)) {
        return TSLAUTH_ERROR_NO_MEMORY;
    }
    if (IsOneOf<ProviderCallTimedOutException, WSATimedOutException>(exception)) {
        return TSLAUTH_ERROR_TIMED_OUT;
    }
    if (IsOneOf<LogonFailureException, InvalidCredentialsException, InvalidPasswordException,
                PasswordExpiredException, AccountDisabledException>(exception)) {
        return TSLAUTH_ERROR_CREDENTIALS;
    }
    if (IsOneOf<ConfigurationError, InvalidKeyException, InvalidActiveDirectoryProviderException,
                InvalidCAMProxyProviderException>(exception)) {
        return TSLAUTH_ERROR_CONFIGURATION;
    }
    if (IsOneOf<IOError, FilePermissionError>(exception)) {
        return TSLAUTH_ERROR_SYSTEM;
    }
    auto const ours = dynamic_cast<Exception const*>(&exception);
    return ours != nullptr && ours->Code() != 0 ? TSLAUTH_ERROR_DOMAIN : TSLAUTH_ERROR_OTHER;
}

} // namespace

Failure::Failure(tslauth_error_kind kind, std::string text) : _kind(kind), _text(std::move(text)) {}

Failure::~Failure() = default;

char const* Failure::what() const noexcept {
    return _text.c_str();
}

tslauth_error ErrorOf(std::exception_ptr const& failure) {
    try {
        std::rethrow_exception(failure);
    } catch (std::exception const& exception) {
        auto const ours = dynamic_cast<Exception const*>(&exception);
        return {KindOf(exception), ours == nullptr ? 0 : ours->Code(), ClassOf(exception),
                exception.what()};
    } catch (...) {
        return {TSLAUTH_ERROR_OTHER, 0, "", "an exception of no known class"};
    }
}

/// For a lack of memory so great that nothing more can be said about it. Never freed: the texts are
/// too short to need memory of their own.
static tslauth_error noMemory = {TSLAUTH_ERROR_NO_MEMORY, 0, "bad_alloc", "no memory"};

int Fail(std::exception_ptr const& failure, tslauth_error** error) noexcept {
    if (error != nullptr) {
        try {
            *error = new tslauth_error(ErrorOf(failure));
        } catch (std::bad_alloc const&) {
            *error = &noMemory;
        }
    }
    return -1;
}

std::string RequiredText(char const* text, char const* what) {
    if (text == nullptr) {
        throw Failure(TSLAUTH_ERROR_USAGE, std::string(what) + " is null");
    }
    return text;
}

void RequireFlags(unsigned flags, unsigned known) {
    if ((flags & ~known) != 0) {
        throw Failure(TSLAUTH_ERROR_USAGE, "a flag that has no meaning here");
    }
}

} // namespace tessel::tslauth_c

using tessel::tslauth_c::noMemory;

unsigned tslauth_c_version(void) {
    return TSLAUTH_C_VERSION;
}

tslauth_error_kind tslauth_error_get_kind(tslauth_error const* error) {
    return error->kind;
}

unsigned long tslauth_error_get_code(tslauth_error const* error) {
    return error->code;
}

char const* tslauth_error_get_class(tslauth_error const* error) {
    return error->name.c_str();
}

char const* tslauth_error_get_text(tslauth_error const* error) {
    return error->text.c_str();
}

void tslauth_error_free(tslauth_error* error) {
    if (error != &noMemory) {
        delete error;
    }
}

size_t tslauth_texts_count(tslauth_texts const* texts) {
    return texts->texts.size();
}

char const* tslauth_texts_get(tslauth_texts const* texts, size_t index) {
    return index < texts->texts.size() ? texts->texts[index].c_str() : nullptr;
}

void tslauth_texts_free(tslauth_texts* texts) {
    delete texts;
}
