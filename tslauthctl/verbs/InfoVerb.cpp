// SPDX-License-Identifier: Apache-2.0
#include "analysis/Failures.h"
#include "analysis/JoinedDomain.h"
#include "analysis/TrustWord.h"
#include "verbs/Verbs.h"

#include <tslauth/Exceptions.h>
#include <tslauth/ProviderConfiguration.h>

#include <exception>

namespace tessel::tslauthctl {

namespace {

using namespace authentication;

/// What a provider that finds nothing to read the trusted domains from means for the trust state;
/// the store answers the same.
constexpr int TrustStateFileNotFound = 7;

/// One part of the store's configuration: what the provider answered, nothing where it does not
/// offer the call, or its failure.
template <typename Value> struct Answered {
    std::optional<Value> value;
    std::exception_ptr failure;
};

template <typename Call> auto Try(Call call) {
    Answered<decltype(call())> answered;
    try {
        answered.value = call();
    } catch (CallNotImplementedException const&) {
        // Nothing is what there is to tell.
    } catch (...) {
        answered.failure = std::current_exception();
    }
    return answered;
}

struct StoreAnswers {
    Answered<Domain> domain;
    Answered<std::deque<std::string>> controllers;
    Answered<std::string> machineAccount;
};

std::string Text(Domain const& domain) {
    if (domain.NetBIOSName().empty()) {
        return domain.DNSName();
    }
    return (domain.DNSName().empty() ? "(no DNS name)" : domain.DNSName()) + " (" +
           domain.NetBIOSName() + ")";
}

nlohmann::json JSON(Domain const& domain) {
    return {{"dns", domain.DNSName()}, {"netbios", domain.NetBIOSName()}};
}

std::string Text(std::string const& text) {
    return text;
}

std::string const& JSON(std::string const& text) {
    return text;
}

/// The state of the trust, the one number there is.
std::string Text(int state) {
    return std::string(TrustWord(state)) + " (" + std::to_string(state) + ")";
}

int JSON(int number) {
    return number;
}

template <typename Value> std::string Text(std::deque<Value> const& values) {
    std::string text;
    for (auto const& value : values) {
        text += (text.empty() ? "" : ", ") + Text(value);
    }
    return text;
}

template <typename Value> nlohmann::json JSON(std::deque<Value> const& values) {
    auto list = nlohmann::json::array();
    for (auto const& value : values) {
        list.push_back(JSON(value));
    }
    return list;
}

bool IsUnset(Domain const& domain) {
    return domain.DNSName().empty() && domain.NetBIOSName().empty();
}

/// What is told about the host's domain, answer by answer.
class Report {
public:
    explicit Report(Console& console) : _console(console) {
        _console.Document()["failures"] = nlohmann::json::array();
    }

    /// @param key of the JSON document
    template <typename Value>
    void Tell(char const* key, char const* label, std::optional<Value> const& value) {
        auto& field = _console.Document()[key] = nullptr;
        if (!value) {
            _console.Line(std::string(label) + ": not told by the provider");
            return;
        }
        field = JSON(*value);
        auto const text = Text(*value);
        _console.Line(std::string(label) + ": " + (text.empty() ? "none" : text));
    }

    void Fail(char const* key, char const* label, Failure const& failure) {
        auto& document = _console.Document();
        document[key] = nullptr;
        auto& told = document["failures"].emplace_back(nlohmann::json::object());
        told["of"] = key;
        told["message"] = failure.what();
        told["exception"] = nullptr;
        if (!failure.ExceptionClass().empty()) {
            told["exception"] = failure.ExceptionClass();
        }
        _console.Warning(std::string(label) + ": cannot be told: " + failure.what());
        if (!_first) {
            _first = failure;
        }
    }

    /// `call` gives the value or throws.
    template <typename Call> void Tell(char const* key, char const* label, Call call) {
        try {
            Tell(key, label, Explaining(Account::none, call));
        } catch (Failure const& e) {
            Fail(key, label, e);
        }
    }

    /// The first failure decides how the command ends.
    std::optional<Failure> const& FirstFailure() const {
        return _first;
    }

private:
    Console& _console;
    std::optional<Failure> _first;
};

template <typename Value> std::optional<Value> ValueOf(Answered<Value> const& answered) {
    if (answered.failure) {
        std::rethrow_exception(answered.failure);
    }
    return answered.value;
}

} // namespace

ExitCode RunInfo(Limit limit, Console& console) {
    auto& document = console.Document();
    document["provider"] = nullptr;
    auto const provider = OpenProvider();
    auto const name = ConfiguredProvider();
    document["provider"] = name;
    document["joined"] = nullptr;
    console.Line("provider: " + name);

    // All at once, so that a provider that hangs costs one limit and not three.
    auto const configuration =
        StartAsking("the provider's answer about the host's own domain", limit, [provider] {
            return StoreAnswers{Try([&] { return provider->GetActiveDomain(); }),
                                Try([&] { return provider->GetPreferredDomainControllers(); }),
                                Try([&] { return provider->GetMachineAccountDN(); })};
        });
    auto const trusted = StartAsking("the provider's list of trusted domains", limit, [provider] {
        return Try([&] { return provider->GetTrustedDomains(); });
    });
    auto const trust =
        StartAsking("the provider's answer about the state of the trust", limit,
                    [provider] { return Try([&] { return provider->GetDomainTrustState(); }); });

    Report report(console);
    bool unjoined = false;
    try {
        auto const answers = AnswerTo(console, configuration);
        if (answers.domain.value) {
            unjoined = IsUnset(*answers.domain.value);
            document["joined"] = !unjoined;
        }
        report.Tell("domain", "domain", [&] { return ValueOf(answers.domain); });
        if (unjoined) {
            document["domain"] = nullptr;
        }
        report.Tell("machine_account", "machine account",
                    [&] { return ValueOf(answers.machineAccount); });
        report.Tell("preferred_domain_controllers", "preferred domain controllers",
                    [&] { return ValueOf(answers.controllers); });
    } catch (Failure const& e) {
        report.Fail("domain", "domain", e);
        report.Fail("machine_account", "machine account", e);
        report.Fail("preferred_domain_controllers", "preferred domain controllers", e);
    }
    bool nothingToRead = false;
    report.Tell("trusted_domains", "trusted domains", [&] {
        try {
            return ValueOf(AnswerTo(console, trusted));
        } catch (FileNotFoundException const&) {
            nothingToRead = true;
            throw;
        }
    });
    report.Tell("trust_state", "trust state", [&]() -> std::optional<int> {
        auto const answer = AnswerTo(console, trust);
        return nothingToRead ? std::optional<int>(TrustStateFileNotFound) : ValueOf(answer);
    });

    document["trust_state_word"] = nullptr;
    if (document["trust_state"].is_number()) {
        document["trust_state_word"] = TrustWord(document["trust_state"].get<int>());
    }

    if (auto const& failure = report.FirstFailure()) {
        console.Error(*failure);
        return failure->Code();
    }
    if (unjoined) {
        console.Error(Failure(ExitCode::notJoined, "The host is not joined to a domain"));
        return ExitCode::notJoined;
    }
    return ExitCode::done;
}

} // namespace tessel::tslauthctl
