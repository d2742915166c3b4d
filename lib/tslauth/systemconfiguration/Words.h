// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMCONFIGURATION_WORDS_H
#define TSLAUTH_SYSTEMCONFIGURATION_WORDS_H

#include <tslauth/systemconfiguration/NSSDatabase.h>
#include <tslauth/systemconfiguration/PAMControl.h>
#include <tslauth/systemconfiguration/PAMFacility.h>

#include <cstddef>
#include <string>
#include <string_view>

/// The words of the system files and the values they stand for, in one table a class. Everything
/// here is inline, because the tool's copy of the readers and printers needs it too.
namespace SystemConfiguration::Words {

template <typename Value> struct Word {
    Value value;
    std::string_view word;
};

/// For each class: its table, the start of its exception's message, and the exception.
template <typename Class> struct Vocabulary;

template <> struct Vocabulary<PAMControl> {
    using Value = PAMControl::Control;
    using Invalid = InvalidControlException;
    static constexpr std::string_view message = "Invalid Control: ";
    static constexpr Word<Value> words[] = {
        {PAMControl::required, "required"},     {PAMControl::requisite, "requisite"},
        {PAMControl::sufficient, "sufficient"}, {PAMControl::optional, "optional"},
        {PAMControl::include, "include"},       {PAMControl::substack, "substack"},
    };
};

template <> struct Vocabulary<PAMFacility> {
    using Value = PAMFacility::Facility;
    using Invalid = InvalidFacilityException;
    static constexpr std::string_view message = "Invalid Facility: ";
    static constexpr Word<Value> words[] = {
        {PAMFacility::auth, "auth"},
        {PAMFacility::account, "account"},
        {PAMFacility::password, "password"},
        {PAMFacility::session, "session"},
    };
};

template <> struct Vocabulary<NSSDatabase> {
    using Value = NSSDatabase::Database;
    using Invalid = InvalidDatabaseException;
    static constexpr std::string_view message = "Invalid Database: ";
    static constexpr Word<Value> words[] = {
        {NSSDatabase::passwd, "passwd"},       {NSSDatabase::group, "group"},
        {NSSDatabase::shadow, "shadow"},       {NSSDatabase::hosts, "hosts"},
        {NSSDatabase::netmasks, "netmasks"},   {NSSDatabase::networks, "networks"},
        {NSSDatabase::protocols, "protocols"}, {NSSDatabase::services, "services"},
        {NSSDatabase::ethers, "ethers"},       {NSSDatabase::rpc, "rpc"},
        {NSSDatabase::netgroup, "netgroup"},   {NSSDatabase::bootparams, "bootparams"},
        {NSSDatabase::publickey, "publickey"}, {NSSDatabase::automount, "automount"},
        {NSSDatabase::aliases, "aliases"},
    };
};

/// The value of a word.
/// @throws the vocabulary's exception, with the refused text
template <typename Class> typename Vocabulary<Class>::Value ValueOf(std::string_view text) {
    for (auto const& entry : Vocabulary<Class>::words) {
        if (entry.word == text) {
            return entry.value;
        }
    }
    std::string message(Vocabulary<Class>::message);
    message += text;
    throw typename Vocabulary<Class>::Invalid(message);
}

/// The word of a value.
/// @throws the vocabulary's exception for a value without a word. The message starts as many
/// characters later as the value says; deliberate: for the only value that a well-formed object can
/// have, 0, that is the whole text.
template <typename Class> std::string_view WordOf(typename Vocabulary<Class>::Value value) {
    for (auto const& entry : Vocabulary<Class>::words) {
        if (entry.value == value) {
            return entry.word;
        }
    }
    auto const offset = static_cast<std::size_t>(value);
    throw
        typename Vocabulary<Class>::Invalid(std::string(Vocabulary<Class>::message.substr(offset)));
}

inline bool IsBracketed(std::string_view text) {
    return !text.empty() && text.front() == '[' && text.back() == ']';
}

/// The control of a whole text, bracketed or a word.
/// @throws InvalidControlException
inline PAMControl ControlOf(std::string_view text) {
    if (IsBracketed(text)) {
        return PAMControl(PAMControl::bracketed, std::string(text));
    }
    return PAMControl(ValueOf<PAMControl>(text));
}

/// The text of a control, which must outlive the result.
/// @throws InvalidControlException
inline std::string_view TextOf(PAMControl const& control) {
    if (control == PAMControl::bracketed) {
        return control.text();
    }
    return WordOf<PAMControl>(control);
}

} // namespace SystemConfiguration::Words

#endif
