// SPDX-License-Identifier: Apache-2.0
#include "Entries.h"

#include "Allocator.h"

#include <array>

namespace tessel::providercheck {

namespace {

typedef std::vector<char const*> Texts;

/// More than a directory has, and less than makes a check of ours slow.
constexpr std::size_t mostElements = 100000;

std::string Or(std::string const& text, char const* otherwise) {
    return text.empty() ? otherwise : text;
}

// --- answers -------------------------------------------------------------------------------------

Answer Coded(int code) {
    Answer answer;
    answer.code = code;
    return answer;
}

Answer Valued(int value) {
    Answer answer;
    answer.value = value;
    return answer;
}

void Hold(Answer& answer, char const* text) {
    answer.texts.emplace_back(text);
    answer.held.push_back(text);
}

/// The call of an entry that hands out one text.
template <typename Call> Answer TextFrom(Call call) {
    char* text = nullptr;
    ActiveDirectoryClientFreeFunction release = nullptr;
    Answer answer = Coded(call(&text, &release));
    if (answer.code != 0) {
        answer.handedOutOnFailure = text != nullptr;
    } else if (text != nullptr) {
        Hold(answer, text);
        if (release != nullptr) {
            answer.release = [text, release] { release(text); };
        }
    }
    return answer;
}

/// How many elements an array has before its null. Where it has a piece of memory of its own, that
/// is as far as it can go.
template <typename Element> std::size_t Count(Element* const* array, Answer& answer) {
    std::size_t const bytes = Allocator::SizeOf(array);
    // NOLINTNEXTLINE(bugprone-sizeof-expression): the elements are pointers
    std::size_t const most = bytes == 0 ? mostElements : bytes / sizeof *array;
    std::size_t count = 0;
    while (count < most && array[count] != nullptr) {
        ++count;
    }
    if (count == most) {
        answer.flaw = "the array has no null at its end";
        return 0;
    }
    return count;
}

/// The call of an entry that hands out an array. `take` adds an element to the answer.
template <typename Element, typename Entry, typename Take>
Answer ArrayFrom(Entry entry, Take take) {
    Element** array = nullptr;
    ActiveDirectoryClientFreeFunction release = nullptr;
    Answer answer = Coded(entry(&array, &release));
    if (answer.code != 0) {
        answer.handedOutOnFailure = array != nullptr;
        return answer;
    }
    if (array != nullptr) {
        std::size_t const count = Count(array, answer);
        for (std::size_t i = 0; i < count; ++i) {
            take(*array[i], answer);
        }
    }
    if (release != nullptr) {
        answer.release = [array, release] { release(array); };
    }
    return answer;
}

Answer ActiveDomain(ActiveDirectoryClientOperationsRecord const& operations) {
    ActiveDirectoryClientDomain domain = {nullptr, nullptr};
    ActiveDirectoryClientFreeFunction release = nullptr;
    Answer answer = Coded(operations.getActiveDomain(&domain, &release));
    if (answer.code != 0) {
        answer.handedOutOnFailure = domain.dnsName != nullptr || domain.netBIOSName != nullptr;
        return answer;
    }
    for (char const* const name : {domain.dnsName, domain.netBIOSName}) {
        if (name != nullptr) {
            Hold(answer, name);
        }
    }
    if (release != nullptr) {
        answer.release = [domain, release] {
            for (char const* const name : {domain.dnsName, domain.netBIOSName}) {
                if (name != nullptr) {
                    release(const_cast<char*>(name)); // the provider's, which may change it
                }
            }
        };
    }
    return answer;
}

void TakeDomain(ActiveDirectoryClientDomain const& domain, Answer& answer) {
    for (char const* const name : {domain.dnsName, domain.netBIOSName}) {
        if (name == nullptr) {
            answer.flaw = "a record has a null name";
        } else {
            answer.texts.emplace_back(name);
        }
    }
}

/// @param result of an entry that leaves its results with the provider
template <std::size_t Number>
Answer Kept(int code, std::array<char*, Number> const& results,
            char const* const (&names)[Number]) {
    Answer answer = Coded(code);
    for (std::size_t i = 0; code == 0 && i < Number; ++i) {
        if (results[i] == nullptr) {
            answer.flaw = std::string(names[i]) + " is null";
        } else {
            Hold(answer, results[i]);
        }
    }
    return answer;
}

// --- the records ---------------------------------------------------------------------------------

/// `call`, unless the record has no such entry.
template <typename Function, typename Call>
std::function<Answer(Texts const&)> Unless(Function missing, Call call) {
    return missing == nullptr ? std::function<Answer(Texts const&)>() : call;
}

std::vector<Entry> Joining(ActiveDirectoryClientOperationsRecord const& record,
                           Profile const& profile) {
    auto const operations = &record;
    Parameter const domain = {"domain", false, Or(profile.domain, "check.invalid")};
    Parameter const user = {"user name", true, "nobody-of-the-check"};
    Parameter const password = {"password", true, CheckedSecret, true};
    return {
        {"joinDomain",
         true,
         {domain, {"unit", true, "OU=Check"}, user, password},
         Unless(operations->joinDomain,
                [operations](Texts const& texts) {
                    ActiveDirectoryClientCredentials const credentials = {texts[2], texts[3]};
                    return Coded(operations->joinDomain(texts[0], texts[1], &credentials));
                })},
        {"partDomain",
         true,
         {user, password},
         Unless(operations->partDomain,
                [operations](Texts const& texts) {
                    ActiveDirectoryClientCredentials const credentials = {texts[0], texts[1]};
                    bool const anybody = texts[0] != nullptr || texts[1] != nullptr;
                    return Coded(operations->partDomain(anybody ? &credentials : nullptr));
                })},
        {"joinDomainWithMachineAccount",
         true,
         {{"NetBIOS name", false, "CHECK"},
          domain,
          {"SID", false, "S-1-5-21-1-2-3"},
          {"account name", false, "checkedhost"},
          {"first result", false, CheckedSecret, true},
          {"second result", false, ""}},
         Unless(operations->apiVersion < 2 ? nullptr : operations->joinDomainWithMachineAccount,
                [operations](Texts const& texts) {
                    ActiveDirectoryClientDomainInformation const information = {"", texts[0],
                                                                                texts[1], texts[2]};
                    ActiveDirectoryClientMachineAccount const account = {texts[3], texts[1], "",
                                                                         texts[4], texts[5]};
                    return Coded(operations->joinDomainWithMachineAccount(&information, &account));
                })},
    };
}

std::vector<Entry> Controllers(ActiveDirectoryClientOperationsRecord const& record,
                               Profile const& profile) {
    auto const operations = &record;
    return {
        {"setPreferredDomainControllers",
         true,
         {{"first name", true, "dc1.check.invalid"}, {"second name", true, "dc2.check.invalid"}},
         Unless(operations->setPreferredDomainControllers,
                [operations](Texts const& texts) {
                    char const* names[] = {texts[0], texts[0] == nullptr ? nullptr : texts[1],
                                           nullptr};
                    return Coded(operations->setPreferredDomainControllers(names));
                })},
        {"getPreferredDomainControllers",
         false,
         {},
         Unless(operations->getPreferredDomainControllers,
                [operations](Texts const&) {
                    return ArrayFrom<char>(
                        operations->getPreferredDomainControllers,
                        [](char const& name, Answer& answer) { answer.texts.emplace_back(&name); });
                })},
        {"getAnyDomainController",
         false,
         {{"first", true, ""}, {"domain", false, Or(profile.domain, "check.invalid")}},
         Unless(operations->getAnyDomainController,
                [operations](Texts const& texts) {
                    return TextFrom([&](char** text, ActiveDirectoryClientFreeFunction* release) {
                        return operations->getAnyDomainController(texts[0], texts[1], text,
                                                                  release);
                    });
                })},
    };
}

std::vector<Entry> Questions(ActiveDirectoryClientOperationsRecord const& record,
                             Profile const& profile) {
    auto const operations = &record;
    Parameter const domain = {"domain", false, Or(profile.domain, "check.invalid")};
    return {
        {"getActiveDomain",
         false,
         {},
         Unless(operations->getActiveDomain,
                [operations](Texts const&) { return ActiveDomain(*operations); })},
        {"getDomainTrustState",
         false,
         {},
         Unless(operations->getDomainTrustState,
                [operations](Texts const&) { return Valued(operations->getDomainTrustState()); })},
        {"getTrustedDomains",
         false,
         {},
         Unless(operations->getTrustedDomains,
                [operations](Texts const&) {
                    return ArrayFrom<ActiveDirectoryClientDomain>(operations->getTrustedDomains,
                                                                  TakeDomain);
                })},
        {"getMachineAccountDN",
         false,
         {},
         Unless(operations->getMachineAccountDN,
                [operations](Texts const&) { return TextFrom(operations->getMachineAccountDN); })},
        {"convertCanonicalUsername",
         false,
         {{"name", false, Or(profile.account, "nobody-of-the-check")}},
         Unless(operations->convertCanonicalUsername,
                [operations](Texts const& texts) {
                    return TextFrom([&](char** text, ActiveDirectoryClientFreeFunction* release) {
                        return operations->convertCanonicalUsername(texts[0], text, release);
                    });
                })},
        {"getHostPrincipalForDomain",
         false,
         {domain},
         Unless(operations->apiVersion < 2 ? nullptr : operations->getHostPrincipalForDomain,
                [operations](Texts const& texts) {
                    return TextFrom([&](char** text, ActiveDirectoryClientFreeFunction* release) {
                        return operations->getHostPrincipalForDomain(texts[0], text, release);
                    });
                })},
        {"getDomainTrustRelationship",
         false,
         {domain},
         Unless(operations->getDomainTrustRelationship,
                [operations](Texts const& texts) {
                    return Valued(operations->getDomainTrustRelationship(texts[0]));
                })},
    };
}

} // namespace

std::vector<Entry> EntriesOf(ActiveDirectoryClientOperationsRecord const& record,
                             Profile const& profile) {
    std::vector<Entry> entries = Questions(record, profile);
    for (auto const& more : {Controllers(record, profile), Joining(record, profile)}) {
        entries.insert(entries.end(), more.begin(), more.end());
    }
    return entries;
}

std::vector<Entry> EntriesOf(CAMProxyClientOperationsRecord const& record, Profile const& profile) {
    auto const operations = &record;
    // Nobody answers there.
    Parameter const server = {"server", false, Or(profile.server, "127.0.0.1")};
    Parameter const thumbprint = {
        "thumbprint", false,
        Or(profile.thumbprint, "00:11:22:33:44:55:66:77:88:99:AA:BB:CC:DD:EE:FF:00:11:22:33")};
    return {
        {"getDomainInformation",
         false,
         {server, thumbprint},
         Unless(operations->getDomainInformation,
                [operations](Texts const& texts) {
                    std::array<char*, 3> results{};
                    int const code = operations->getDomainInformation(
                        texts[0], 1, texts[1], &results[0], &results[1], &results[2]);
                    return Kept(code, results, {"the NetBIOS name", "the DNS name", "the SID"});
                })},
        {"createMachineAccount",
         true,
         {server, {"account name", false, "checkedhost"}, {"unit", true, "OU=Check"}, thumbprint},
         Unless(operations->createMachineAccount,
                [operations](Texts const& texts) {
                    std::array<char*, 2> results{};
                    int const code = operations->createMachineAccount(
                        texts[0], texts[1], texts[2], 1, texts[3], &results[0], &results[1]);
                    return Kept(code, results, {"the first result", "the second result"});
                })},
    };
}

std::vector<Entry> EntriesOf(Provider const& provider, Kind kind, Profile const& profile) {
    return kind == Kind::CAM ? EntriesOf(*provider.CAMOperations(), profile)
                             : EntriesOf(*provider.Operations(), profile);
}

} // namespace tessel::providercheck
