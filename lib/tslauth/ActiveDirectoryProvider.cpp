// SPDX-License-Identifier: Apache-2.0
#include <tslauth/ActiveDirectoryProvider.h>

#include "ProviderLibrary.h"
#include "ThrowMappedException.h"

#include <tslauth/string_cast.h>
#include <tslauth/tslauth_provider.h>

#include <cstddef>
#include <locale>
#include <sstream>
#include <type_traits>
#include <vector>

namespace tessel::authentication {

namespace {

// A Credentials object is handed to the provider as it stands.
static_assert(std::is_standard_layout_v<Credentials>);
static_assert(sizeof(Credentials) == sizeof(ActiveDirectoryClientCredentials));
static_assert(offsetof(Credentials, userName) ==
              offsetof(ActiveDirectoryClientCredentials, userName));
static_assert(offsetof(Credentials, password) ==
              offsetof(ActiveDirectoryClientCredentials, password));

ActiveDirectoryClientCredentials const* RecordOf(Credentials const& credentials) {
    return reinterpret_cast<ActiveDirectoryClientCredentials const*>(&credentials);
}

std::string TextOrEmpty(char const* text) {
    return text == nullptr ? std::string() : std::string(text);
}

/// The words of `text`, which may be null.
std::list<std::string> Words(char const* text) {
    std::list<std::string> words;
    if (text != nullptr) {
        std::istringstream stream(text);
        stream.imbue(std::locale::classic());
        for (std::string word; stream >> word;) {
            words.push_back(word);
        }
    }
    return words;
}

/// `entry` of `operations`, a member that came with version 2: whatever an older record holds there
/// was not meant to be called.
template <typename Entry>
Entry ImplementedInVersion2(Entry entry, ActiveDirectoryClientOperationsRecord const& operations) {
    return Implemented(operations.apiVersion < 2 ? nullptr : entry);
}

/// Ends an operation whose entry has failed. What a code means is decided out of line, so that a
/// call that succeeds pays one comparison.
void Check(int code) {
    if (code != TSLAUTH_PROVIDER_SUCCESS) {
        ThrowMappedException(static_cast<ActiveDirectoryClientErrorCode>(code));
    }
}

/// Gives a provider's memory back when the result has been copied, or could not be. It is made
/// after a call has succeeded: a call that failed has handed out nothing.
class ProviderMemory {
public:
    ProviderMemory(void* memory, ActiveDirectoryClientFreeFunction release)
        : _memory(memory), _release(release) {}
    ProviderMemory(ProviderMemory const&) = delete;
    ProviderMemory& operator=(ProviderMemory const&) = delete;
    ~ProviderMemory() {
        if (_release != nullptr) {
            _release(_memory);
        }
    }

private:
    void* _memory;
    ActiveDirectoryClientFreeFunction _release;
};

/// A single text is released only if there is one; an array always is.
ActiveDirectoryClientFreeFunction ReleaseOf(char const* text,
                                            ActiveDirectoryClientFreeFunction release) {
    return text == nullptr ? nullptr : release;
}

/// The text that `call(slot, free-function slot)` stores.
template <typename Call> std::string StringFrom(Call call) {
    char* text = nullptr;
    ActiveDirectoryClientFreeFunction release = nullptr;
    Check(call(&text, &release));
    ProviderMemory const memory(text, ReleaseOf(text, release));
    return TextOrEmpty(text);
}

/// One `convert(element)` for each element of the array that `entry` stores, up to its null.
template <typename Result, typename Element, typename Convert>
std::deque<Result> ArrayFrom(int (*entry)(Element***, ActiveDirectoryClientFreeFunction*),
                             Convert convert) {
    Element** array = nullptr;
    ActiveDirectoryClientFreeFunction release = nullptr;
    Check(Implemented(entry)(&array, &release));
    ProviderMemory const memory(array, release);
    std::deque<Result> results;
    if (array != nullptr) {
        for (Element** element = array; *element != nullptr; ++element) {
            results.push_back(convert(**element));
        }
    }
    return results;
}

} // namespace

ActiveDirectoryProvider::ActiveDirectoryProvider(std::string const& name)
    : _library(LoadProvider(name, RTLD_LAZY, "Unable to open provider: ")), _metadata(nullptr),
      _operations(nullptr) {
    // Every throw from here on closes the library again: its owner is complete.
    _metadata =
        FindRecord<ActiveDirectoryClientMetadataRecord>(_library, "ActiveDirectoryClientMetadata");
    if (_metadata == nullptr) {
        throw InvalidActiveDirectoryProviderException(name, LoaderError());
    }
    if (_metadata->apiVersion > TSLAUTH_PROVIDER_API_VERSION) {
        throw InvalidActiveDirectoryProviderException(
            name, "The API version (" + string_cast(_metadata->apiVersion) +
                      ") is not supported by this version of libtslauth");
    }
    _operations = FindRecord<ActiveDirectoryClientOperationsRecord>(
        _library, "ActiveDirectoryClientOperations");
    if (_operations == nullptr) {
        throw InvalidActiveDirectoryProviderException(name, LoaderError());
    }
    CacheMetadata();
}

ActiveDirectoryProvider::~ActiveDirectoryProvider() {
    // The library goes before the texts, whose memory a provider's last functions may still see.
    _library.reset();
}

void ActiveDirectoryProvider::CacheMetadata() {
    _pamModule = _metadata->pamModule;
    _pamModuleParameters = Words(_metadata->pamModuleParameters);
    _nssModule = _metadata->nssModule;
    _nssModuleParameters = Words(_metadata->nssModuleParameters);
}

std::string const& ActiveDirectoryProvider::PAMModule() const noexcept {
    return _pamModule;
}

std::list<std::string> const& ActiveDirectoryProvider::PAMModuleParameters() const noexcept {
    return _pamModuleParameters;
}

std::string const& ActiveDirectoryProvider::NSSModule() const noexcept {
    return _nssModule;
}

std::list<std::string> const& ActiveDirectoryProvider::NSSModuleParameters() const noexcept {
    return _nssModuleParameters;
}

int ActiveDirectoryProvider::GetAPIVersion() const noexcept {
    return _operations->apiVersion;
}

void ActiveDirectoryProvider::JoinDomain(std::string const& domain,
                                         std::string const& organisationalUnit,
                                         Credentials const& credentials) const {
    Check(Implemented(_operations->joinDomain)(domain.c_str(), OptionalText(organisationalUnit),
                                               RecordOf(credentials)));
}

void ActiveDirectoryProvider::JoinDomainWithMachineAccount(
    CAM::ActiveDirectoryDomainInfo const& domainInfo,
    CAM::MachineAccountInfo const& account) const {
    auto const entry =
        ImplementedInVersion2(_operations->joinDomainWithMachineAccount, *_operations);
    ActiveDirectoryClientDomainInformation const domainRecord = {
        domainInfo.unused.c_str(), domainInfo.netBIOSDomainName.c_str(),
        domainInfo.dnsDomainName.c_str(), domainInfo.domainSID.c_str()};
    ActiveDirectoryClientMachineAccount const accountRecord = {
        account.accountName.c_str(), account.dnsDomainName.c_str(), account.unused.c_str(),
        account.firstResult.c_str(), account.secondResult.c_str()};
    Check(entry(&domainRecord, &accountRecord));
}

void ActiveDirectoryProvider::PartDomain() const {
    Check(Implemented(_operations->partDomain)(nullptr));
}

void ActiveDirectoryProvider::PartDomain(Credentials const& credentials) const {
    Check(Implemented(_operations->partDomain)(RecordOf(credentials)));
}

Domain ActiveDirectoryProvider::GetActiveDomain() const {
    ActiveDirectoryClientDomain record = {nullptr, nullptr};
    ActiveDirectoryClientFreeFunction release = nullptr;
    Check(Implemented(_operations->getActiveDomain)(&record, &release));
    // The interface shows both names as constant, but their owner may release them.
    ProviderMemory const netBIOSName(const_cast<char*>(record.netBIOSName),
                                     ReleaseOf(record.netBIOSName, release));
    ProviderMemory const dnsName(const_cast<char*>(record.dnsName),
                                 ReleaseOf(record.dnsName, release));
    return Domain(TextOrEmpty(record.dnsName), TextOrEmpty(record.netBIOSName));
}

void ActiveDirectoryProvider::SetPreferredDomainControllers(
    std::deque<std::string> const& controllers) const {
    auto const entry = Implemented(_operations->setPreferredDomainControllers);
    std::vector<char const*> names;
    names.reserve(controllers.size() + 1);
    for (std::string const& controller : controllers) {
        names.push_back(controller.c_str());
    }
    names.push_back(nullptr);
    Check(entry(names.data()));
}

std::deque<std::string> ActiveDirectoryProvider::GetPreferredDomainControllers() const {
    return ArrayFrom<std::string>(_operations->getPreferredDomainControllers,
                                  [](char const& name) { return std::string(&name); });
}

std::string ActiveDirectoryProvider::GetAnyDomainController(std::string const& first,
                                                            std::string const& domain) const {
    auto const entry = Implemented(_operations->getAnyDomainController);
    return StringFrom(
        [&](auto... slots) { return entry(OptionalText(first), domain.c_str(), slots...); });
}

int ActiveDirectoryProvider::GetDomainTrustState() const {
    return Implemented(_operations->getDomainTrustState)();
}

std::deque<Domain> ActiveDirectoryProvider::GetTrustedDomains() const {
    return ArrayFrom<Domain>(_operations->getTrustedDomains,
                             [](ActiveDirectoryClientDomain const& record) {
                                 return Domain(record.dnsName, record.netBIOSName);
                             });
}

std::string ActiveDirectoryProvider::GetMachineAccountDN() const {
    return StringFrom(Implemented(_operations->getMachineAccountDN));
}

std::string ActiveDirectoryProvider::ConvertCanonicalUsername(std::string const& name) const {
    auto const entry = Implemented(_operations->convertCanonicalUsername);
    return StringFrom([&](auto... slots) { return entry(name.c_str(), slots...); });
}

std::string ActiveDirectoryProvider::GetHostPrincipalForDomain(std::string const& domain) const {
    auto const entry = ImplementedInVersion2(_operations->getHostPrincipalForDomain, *_operations);
    return StringFrom([&](auto... slots) { return entry(domain.c_str(), slots...); });
}

int ActiveDirectoryProvider::GetDomainTrustRelationship(std::string const& domain) const {
    return Implemented(_operations->getDomainTrustRelationship)(domain.c_str());
}

std::string ActiveDirectoryProvider::GetLastFailure() const {
    auto const entry = reinterpret_cast<decltype(&ActiveDirectoryClientLastFailure)>(
        dlsym(_library.get(), "ActiveDirectoryClientLastFailure"));
    return entry == nullptr ? std::string() : TextOrEmpty(entry());
}

std::string ActiveDirectoryProvider::PreviewJoin(std::string const& domain,
                                                 std::string const& organisationalUnit,
                                                 Credentials const* credentials) const {
    auto const entry = reinterpret_cast<decltype(&ActiveDirectoryClientPreviewJoin)>(
        dlsym(_library.get(), "ActiveDirectoryClientPreviewJoin"));
    if (entry == nullptr) {
        return {};
    }
    return StringFrom([&](auto... slots) {
        return entry(domain.c_str(), OptionalText(organisationalUnit),
                     credentials == nullptr ? nullptr : RecordOf(*credentials), slots...);
    });
}

} // namespace tessel::authentication
