// SPDX-License-Identifier: Apache-2.0
#include "Directory.h"

#include <cstring>
#include <strings.h>

namespace tessel::providercheck {

namespace {

/// Calls an entry by its name; an empty answer where there is none.
class Calls {
public:
    explicit Calls(Session& session) : _session(session), _entries(session.Callable(true)) {}

    bool Has(char const* name) const {
        return Find(name) != nullptr;
    }

    Answer operator()(char const* name, char const* words,
                      std::vector<std::optional<std::string>> texts) const {
        Entry const* const entry = Find(name);
        return entry == nullptr ? Answer()
                                : _session.CallAndRelease(*entry, {words, std::move(texts)});
    }

private:
    Entry const* Find(char const* name) const {
        for (Entry const* const entry : _entries) {
            if (std::strcmp(entry->name, name) == 0) {
                return entry;
            }
        }
        return nullptr;
    }

    Session& _session;
    std::vector<Entry const*> _entries;
};

/// Writes down what is not as it is said.
class Expectation {
public:
    explicit Expectation(Recorder& recorder) : _recorder(recorder) {}

    void operator()(bool holds, char const* what) {
        _recorder.Examined(Rule::Joins);
        if (!holds) {
            _recorder.Found(Rule::Joins, "not so: %s", what);
        }
    }
    void Code(Answer const& answer, int code, char const* what) {
        _recorder.Examined(Rule::Joins);
        if (answer.code != code) {
            _recorder.Found(Rule::Joins, "%s: %d instead of %d", what, answer.code.value_or(-1),
                            code);
        }
    }

private:
    Recorder& _recorder;
};

bool IsJoined(Calls const& call, char const* words) {
    return !call("getActiveDomain", words, {}).texts.empty();
}

void AskOfJoined(Calls const& call, Expectation& expect, Profile const& profile) {
    constexpr char words[] = "of a joined host";
    auto const domain = call("getActiveDomain", words, {}).texts;
    expect(!domain.empty() && strcasecmp(domain[0].c_str(), profile.domain.c_str()) == 0,
           "a joined host's active domain is the one that it has joined");
    if (call.Has("getDomainTrustState")) {
        expect(call("getDomainTrustState", words, {}).value == TSLAUTH_PROVIDER_TRUST_IN_ORDER,
               "a host that has just joined has its trust in order");
    }
    if (call.Has("getTrustedDomains")) {
        expect.Code(call("getTrustedDomains", words, {}), 0, "the trusted domains");
    }
    if (call.Has("getMachineAccountDN")) {
        expect(!call("getMachineAccountDN", words, {}).texts.empty(),
               "a joined host has a machine account");
    }
    if (call.Has("getAnyDomainController")) {
        expect(!call("getAnyDomainController", words, {std::nullopt, profile.domain}).texts.empty(),
               "the joined domain has a controller");
    }
    if (call.Has("getHostPrincipalForDomain")) {
        expect(!call("getHostPrincipalForDomain", words, {profile.domain}).texts.empty(),
               "a joined host has a principal in its domain");
    }
    if (call.Has("convertCanonicalUsername") && !profile.account.empty()) {
        expect(!call("convertCanonicalUsername", words, {profile.account}).texts.empty(),
               "the domain's account is known to the host");
    }
}

} // namespace

void Join(Session& session, Profile const& profile) {
    Calls const call(session);
    Expectation expect(session.Notes());
    if (!call.Has("joinDomain") || !call.Has("getActiveDomain")) {
        return;
    }
    if (IsJoined(call, "before the join")) {
        session.Notes().Found(Rule::Joins, "the host is joined already: part it first");
        return;
    }
    expect.Code(call("joinDomain", "with a wrong password",
                     {profile.domain, std::nullopt, profile.user, CheckedSecret}),
                TSLAUTH_PROVIDER_LOGON_FAILURE, "a join with a wrong password");
    expect(!IsJoined(call, "after a join that failed"),
           "a join that fails leaves the host in no domain");
    expect.Code(call("joinDomain", "with the profile's account",
                     {profile.domain, std::nullopt, profile.user, profile.password}),
                0, "the join");
    AskOfJoined(call, expect, profile);
}

void Part(Session& session, Profile const& profile) {
    Calls const call(session);
    Expectation expect(session.Notes());
    if (!call.Has("partDomain") || !call.Has("getActiveDomain")) {
        return;
    }
    expect(IsJoined(call, "in another process"), "a joined host is joined for every process");
    expect.Code(call("partDomain", "with the profile's account", {profile.user, profile.password}),
                0, "the part");
    expect(!IsJoined(call, "after the part"), "a host that has parted is in no domain");
}

} // namespace tessel::providercheck
