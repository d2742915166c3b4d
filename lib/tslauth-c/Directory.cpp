// SPDX-License-Identifier: Apache-2.0
#include "Directory.h"

#include "Factory.h"

#include <tslauth/Exceptions.h>
#include <tslauth/HostLock.h>

#include <cstring>
#include <utility>

namespace tessel::tslauth_c {

using namespace authentication;

Secret::Secret(char const* text) : _isNull(text == nullptr), _text(_isNull ? "" : text) {}

Secret::~Secret() {
    explicit_bzero(_text.data(), _text.size());
}

Directory::Directory(int seconds) : _store(seconds), _seconds(seconds) {}

void Directory::Join(std::string const& domain, char const* user, char const* password,
                     unsigned flags) {
    RequireFlags(flags, TSLAUTH_SKIP_HOSTNAME_CHECK);
    HostLock lock;
    TakeLock(lock, _seconds);
    _store.JoinDomain(domain, {user, password}, (flags & TSLAUTH_SKIP_HOSTNAME_CHECK) != 0);
}

void Directory::JoinThroughCAM(std::string const& server, std::string const& unit, unsigned flags) {
    RequireFlags(flags, TSLAUTH_SKIP_HOSTNAME_CHECK);
    HostLock lock;
    TakeLock(lock, _seconds);
    _store.JoinDomainWithCAM(server, unit, (flags & TSLAUTH_SKIP_HOSTNAME_CHECK) != 0);
}

void Directory::Part(char const* user, char const* password) {
    if ((user == nullptr) != (password == nullptr)) {
        throw Failure(TSLAUTH_ERROR_USAGE, "a user without a password, or the other way round");
    }
    HostLock lock;
    TakeLock(lock, _seconds);
    if (user == nullptr) {
        _store.PartDomain();
    } else {
        _store.PartDomain({user, password});
    }
}

tslauth_answer Directory::Ask(tslauth_question question) {
    auto const index = static_cast<std::size_t>(question);
    if (index >= _last.size()) {
        throw Failure(TSLAUTH_ERROR_USAGE, "no such question");
    }
    try {
        tslauth_answer answer = AskNow(question);
        std::lock_guard<std::mutex> const guard(_lock);
        _last[index] = Remembered{answer, Clock::now()};
        return answer;
    } catch (ProviderCallTimedOutException const&) {
        std::lock_guard<std::mutex> const guard(_lock);
        if (!_last[index]) {
            throw;
        }
        tslauth_answer answer = _last[index]->answer;
        answer.age = std::chrono::duration<double>(Clock::now() - _last[index]->given).count();
        return answer;
    }
}

tslauth_answer Directory::AskNow(tslauth_question question) const {
    tslauth_answer answer;
    auto const add = [&answer](Domain const& domain) {
        answer.domains.emplace_back(domain.DNSName(), domain.NetBIOSName());
    };
    switch (question) {
    case TSLAUTH_QUESTION_MEMBERSHIP: {
        ActiveDirectoryStoreConfiguration const membership = _store.AskStoreConfiguration(_seconds);
        if (!(membership.activeDomain == Domain())) {
            add(membership.activeDomain);
        }
        answer.controllers.texts.assign(membership.preferredDomainControllers.begin(),
                                        membership.preferredDomainControllers.end());
        answer.machineAccount = membership.machineAccountDN;
        break;
    }
    case TSLAUTH_QUESTION_TRUSTED_DOMAINS:
        for (Domain const& domain : _store.AskTrustedDomains(_seconds)) {
            add(domain);
        }
        break;
    case TSLAUTH_QUESTION_TRUST_STATE:
        answer.trustState = _store.AskDomainTrustState(_seconds);
        break;
    }
    return answer;
}

} // namespace tessel::tslauth_c

using namespace tessel::tslauth_c;

int tslauth_directory_open(int seconds, tslauth_directory** directory, tslauth_error** error) {
    return Guarded(error, [&] {
        (void)Factory(); // what a store records is looked up there
        *directory = new tslauth_directory{std::make_shared<Directory>(seconds)};
    });
}

void tslauth_directory_free(tslauth_directory* directory) {
    delete directory;
}

int tslauth_directory_join(tslauth_directory* directory, char const* domain, char const* user,
                           char const* password, unsigned flags, tslauth_error** error) {
    return Guarded(error, [&] {
        directory->directory->Join(RequiredText(domain, "the domain"), user, password, flags);
    });
}

int tslauth_directory_join_through_cam(tslauth_directory* directory, char const* server,
                                       char const* unit, unsigned flags, tslauth_error** error) {
    return Guarded(error, [&] {
        directory->directory->JoinThroughCAM(RequiredText(server, "the server"),
                                             unit == nullptr ? "" : unit, flags);
    });
}

int tslauth_directory_part(tslauth_directory* directory, char const* user, char const* password,
                           tslauth_error** error) {
    return Guarded(error, [&] { directory->directory->Part(user, password); });
}

int tslauth_directory_ask(tslauth_directory* directory, tslauth_question question,
                          tslauth_answer** answer, tslauth_error** error) {
    return Guarded(error,
                   [&] { *answer = new tslauth_answer(directory->directory->Ask(question)); });
}

double tslauth_answer_get_age(tslauth_answer const* answer) {
    return answer->age;
}

size_t tslauth_answer_domain_count(tslauth_answer const* answer) {
    return answer->domains.size();
}

char const* tslauth_answer_dns_name(tslauth_answer const* answer, size_t domain) {
    return domain < answer->domains.size() ? answer->domains[domain].first.c_str() : nullptr;
}

char const* tslauth_answer_netbios_name(tslauth_answer const* answer, size_t domain) {
    return domain < answer->domains.size() ? answer->domains[domain].second.c_str() : nullptr;
}

tslauth_texts const* tslauth_answer_controllers(tslauth_answer const* answer) {
    return &answer->controllers;
}

char const* tslauth_answer_machine_account(tslauth_answer const* answer) {
    return answer->machineAccount.c_str();
}

int tslauth_answer_trust_state(tslauth_answer const* answer) {
    return answer->trustState;
}

void tslauth_answer_free(tslauth_answer* answer) {
    delete answer;
}
