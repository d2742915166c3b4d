// SPDX-License-Identifier: Apache-2.0
// The PAM module of the provider. A user of the host's own files is none of its business: for him
// every entry answers PAM_IGNORE at once, as if it did not stand there. Everybody else is Samba's
// module's, which is loaded from the same folder, but for the entry with the parameter
// `check_only`: that one, in `account`, asks whether the domain lets the user log in.
#include "Failure.h"
#include "Paths.h"
#include "host/ChildProcess.h"
#include "modules/AccountBounds.h"
#include "modules/LocalAccounts.h"
#include "text/AccountAnswer.h"
#include "text/SambaDomain.h"

#include <algorithm>
#include <dlfcn.h>
#include <exception>
#include <fstream>
#include <iterator>
#include <security/pam_ext.h>
#include <security/pam_modules.h>
#include <string>
#include <syslog.h>
#include <vector>

using namespace tessel::winbind;

namespace {

typedef int (*ModuleFunction)(pam_handle_t*, int, int, char const**);

/// Says, for the rest of a log-in, that Samba's module has taken this user's password.
constexpr char authenticated[] = "tslauth_winbind_authenticated";

enum class Whose { Local, Directory, Unknown };

Whose WhoseName(char const* name) {
    LocalAccounts users = ReadLocalAccounts(LOCAL_USERS_FILE);
    Whose const whose = users.text == nullptr       ? Whose::Unknown
                        : IsLocalName(&users, name) ? Whose::Local
                                                    : Whose::Directory;
    FreeLocalAccounts(&users);
    return whose;
}

/// The arguments of a call, as libpam hands them over.
struct Call {
    pam_handle_t* handle;
    int flags;
    std::vector<char const*> arguments;

    bool TakeCheckOnly() {
        auto const end = std::remove(arguments.begin(), arguments.end(), std::string("check_only"));
        bool const found = end != arguments.end();
        arguments.erase(end, arguments.end());
        return found;
    }
};

/// The name that the log-in is for; empty where there is none.
std::string UserOf(pam_handle_t* handle) {
    void const* user = nullptr;
    bool const isSet = pam_get_item(handle, PAM_USER, &user) == PAM_SUCCESS && user != nullptr;
    return isSet ? static_cast<char const*>(user) : std::string();
}

/// Beside this file, wherever that is. Never unloaded: what it has left with libpam it has to clean
/// up itself, when this module may be gone already.
void* SambaModule(pam_handle_t* handle) {
    Dl_info self = {};
    if (::dladdr(&authenticated, &self) == 0) {
        return nullptr;
    }
    std::string path = self.dli_fname;
    path.replace(path.rfind('/') + 1, std::string::npos, Paths::SambaPAMModule);
    void* const module = ::dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL | RTLD_NODELETE);
    if (module == nullptr) {
        pam_syslog(handle, LOG_ERR, "cannot load Samba's module: %s", ::dlerror());
    }
    return module;
}

int Forward(char const* function, Call& call) {
    void* const module = SambaModule(call.handle);
    if (module == nullptr) {
        return PAM_MODULE_UNKNOWN;
    }
    auto const found = reinterpret_cast<ModuleFunction>(::dlsym(module, function));
    int const result = found == nullptr
                           ? PAM_SYMBOL_ERR
                           : found(call.handle, call.flags, static_cast<int>(call.arguments.size()),
                                   call.arguments.data());
    (void)::dlclose(module); // what is counted is this use alone
    return result;
}

/// Samba's module puts the name that winbindd knows a user by in place of the one that was typed.
/// That may be a local user's, who would be logged in then.
bool HasBecomeLocal(pam_handle_t* handle, std::string const& user) {
    std::string const name = UserOf(handle);
    if (name == user || WhoseName(name.c_str()) == Whose::Directory) {
        return false;
    }
    pam_syslog(handle, LOG_WARNING, "'%s' of the domain would become the local user '%s'",
               user.c_str(), name.c_str());
    // Whether it fails or not, the log-in does.
    (void)pam_set_item(handle, PAM_USER, user.c_str());
    return true;
}

void FreeText(pam_handle_t* /*handle*/, void* text, int /*status*/) {
    delete static_cast<std::string*>(text);
}

void RememberAuthenticated(pam_handle_t* handle) {
    auto* const user = new std::string(UserOf(handle));
    if (pam_set_data(handle, authenticated, user, &FreeText) != PAM_SUCCESS) {
        delete user; // the domain is asked once more
    }
}

bool IsAuthenticated(pam_handle_t* handle, std::string const& user) {
    void const* found = nullptr;
    return pam_get_data(handle, authenticated, &found) == PAM_SUCCESS && found != nullptr &&
           *static_cast<std::string const*>(found) == user;
}

/// Where users may log in while no controller answers, winbindd has to know that none does.
void PrepareForPassword(pam_handle_t* handle) {
    std::ifstream file(Paths::OwnSamba);
    std::string const text(std::istreambuf_iterator<char>(file), {});
    if (!LetsInOffLine(text)) {
        return;
    }
    try {
        (void)ChildProcess::Run({{Paths::AccountProgram, "--reach"}},
                                Clock::now() + AccountBounds::Program);
    } catch (Failure const& failure) {
        pam_syslog(handle, LOG_ERR, "%s", failure.what()); // winbindd notices some time by itself
    }
}

AccountAnswer AskDomain(pam_handle_t* handle, std::string const& user) {
    try {
        ChildProcess::Outcome const outcome = ChildProcess::Run(
            {{Paths::AccountProgram, user}}, Clock::now() + AccountBounds::Program);
        if (auto const answer = AnswerIn(outcome.output)) {
            return *answer;
        }
        pam_syslog(handle, LOG_ERR, "'%s' ended with %d and without an answer",
                   Paths::AccountProgram, outcome.code);
    } catch (Failure const& failure) {
        pam_syslog(handle, LOG_ERR, "%s", failure.what());
    }
    return AccountAnswer::NoAnswer;
}

int Refuse(Call const& call, int code, char const* text) {
    if ((static_cast<unsigned int>(call.flags) & PAM_SILENT) == 0) {
        (void)pam_error(call.handle, "%s", text); // without a word he is refused all the same
    }
    return code;
}

/// The password, if there was one, has been taken by a controller, or by winbindd's memory of one:
/// that was the domain's word.
int CheckAccount(Call const& call, std::string const& user) {
    if (IsAuthenticated(call.handle, user)) {
        return PAM_SUCCESS;
    }
    switch (AskDomain(call.handle, user)) {
    case AccountAnswer::NotOfTheDomain:
        return PAM_IGNORE;
    case AccountAnswer::InOrder:
    case AccountAnswer::OffLine:
        return PAM_SUCCESS;
    case AccountAnswer::Disabled:
        return Refuse(call, PAM_ACCT_EXPIRED,
                      "Your account is disabled. Please see your system administrator.");
    case AccountAnswer::LockedOut:
        return Refuse(call, PAM_PERM_DENIED,
                      "Your account has been locked. Please see your system administrator.");
    case AccountAnswer::Expired:
        return Refuse(call, PAM_ACCT_EXPIRED,
                      "Your account has expired. Please see your system administrator.");
    case AccountAnswer::NoAnswer:
        break;
    }
    return Refuse(call, PAM_AUTHINFO_UNAVAIL,
                  "The domain does not answer whether you may log in. Please try again later.");
}

int Answer(char const* function, Call call) {
    char const* name = nullptr;
    int const found = pam_get_user(call.handle, &name, nullptr);
    if (found != PAM_SUCCESS) {
        return found;
    }
    std::string const user = name;
    switch (WhoseName(user.c_str())) {
    case Whose::Local:
        return PAM_IGNORE;
    case Whose::Unknown:
        pam_syslog(call.handle, LOG_ERR, "cannot read '%s'", LOCAL_USERS_FILE);
        return PAM_SYSTEM_ERR;
    case Whose::Directory:
        break;
    }
    bool const isAuthentication = function == std::string("pam_sm_authenticate");
    if (call.TakeCheckOnly()) {
        return function == std::string("pam_sm_acct_mgmt") ? CheckAccount(call, user) : PAM_IGNORE;
    }
    if (isAuthentication) {
        PrepareForPassword(call.handle);
    }
    int const result = Forward(function, call);
    if (HasBecomeLocal(call.handle, user)) {
        return PAM_PERM_DENIED;
    }
    if (isAuthentication && result == PAM_SUCCESS) {
        RememberAuthenticated(call.handle);
    }
    return result;
}

/// No exception may reach libpam.
int Entry(char const* function, pam_handle_t* handle, int flags, int count,
          char const** arguments) noexcept {
    try {
        return Answer(function, {handle, flags, {arguments, arguments + count}});
    } catch (std::exception const& failure) {
        pam_syslog(handle, LOG_ERR, "%s", failure.what());
        return PAM_SYSTEM_ERR;
    }
}

} // namespace

#define ENTRY(name)                                                                                \
    extern "C" __attribute__((visibility("default"))) int name(                                    \
        pam_handle_t* handle, int flags, int count, char const** arguments) {                      \
        return Entry(#name, handle, flags, count, arguments);                                      \
    }

ENTRY(pam_sm_authenticate)
ENTRY(pam_sm_setcred)
ENTRY(pam_sm_acct_mgmt)
ENTRY(pam_sm_open_session)
ENTRY(pam_sm_close_session)
ENTRY(pam_sm_chauthtok)
