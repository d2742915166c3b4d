// SPDX-License-Identifier: Apache-2.0
#include "Provider.h"

#include "Entries.h"
#include "ProcessState.h"
#include "Profile.h"

#include <cstring>
#include <dlfcn.h>
#include <elf.h>
#include <link.h>
#include <sys/stat.h>

namespace tessel::providercheck {

namespace {

constexpr char metadataSymbol[] = "ActiveDirectoryClientMetadata";
constexpr char operationsSymbol[] = "ActiveDirectoryClientOperations";
constexpr char camSymbol[] = "CAMProxyClientOperations";

int Flags(Kind kind) {
    return kind == Kind::CAM ? RTLD_LAZY | RTLD_GLOBAL : RTLD_LAZY;
}

bool IsBlank(char const* text) {
    return text == nullptr || text[std::strspn(text, " \t\n\v\f\r")] == '\0';
}

void LookAtVersion(char const* record, std::int32_t version, Recorder& recorder) {
    recorder.Examined(Rule::Version);
    if (version < 0 || version > TSLAUTH_PROVIDER_API_VERSION) {
        recorder.Found(Rule::Version, "%s states version %d", record, version);
    }
}

/// Whether the record is whole, so that its members may be read.
bool IsWhole(Provider const& provider, char const* symbol, std::size_t least, Recorder& recorder) {
    std::size_t const size = provider.SizeOf(symbol);
    recorder.Examined(Rule::RecordSize);
    if (size < least) {
        recorder.Found(Rule::RecordSize, "%s has %zu bytes of %zu", symbol, size, least);
    }
    return size >= least;
}

/// @param name of the field
void LookAtName(char const* name, char const* text, char const* forbidden, Recorder& recorder) {
    recorder.Examined(Rule::Metadata);
    if (text == nullptr || *text == '\0') {
        recorder.Found(Rule::Metadata, "%s is %s", name, text == nullptr ? "null" : "empty");
    } else if (std::strpbrk(text, forbidden) != nullptr) {
        recorder.Found(Rule::Metadata, "%s is '%s'", name, text);
    }
}

void LookAtMetadata(ActiveDirectoryClientMetadataRecord const& metadata, Recorder& recorder) {
    LookAtVersion(metadataSymbol, metadata.apiVersion, recorder);
    LookAtName("pamModule", metadata.pamModule, "/ \t\n\v\f\r#[]\\", recorder);
    LookAtName("nssModule", metadata.nssModule, "/ \t\n\v\f\r#[]:!=", recorder);
    recorder.Examined(Rule::NameServiceParameters);
    if (!IsBlank(metadata.nssModuleParameters)) {
        recorder.Found(Rule::NameServiceParameters, "nssModuleParameters is '%s'",
                       metadata.nssModuleParameters);
    }
}

void LookAtOperations(ActiveDirectoryClientOperationsRecord const& operations, Recorder& recorder) {
    LookAtVersion(operationsSymbol, operations.apiVersion, recorder);
    if (operations.apiVersion < 2 && (operations.joinDomainWithMachineAccount != nullptr ||
                                      operations.getHostPrincipalForDomain != nullptr)) {
        recorder.Found(Rule::Version, "%s fills entries of version 2, and states %d",
                       operationsSymbol, operations.apiVersion);
    }
    recorder.Examined(Rule::Unused);
    if (operations.unused != nullptr) {
        recorder.Found(Rule::Unused, "the entry 'unused' is filled");
    }
}

void NoteEntries(Provider const& provider, Kind kind, Recorder& recorder) {
    recorder.kind = static_cast<int>(kind);
    auto const entries = EntriesOf(provider, kind, Profile());
    for (std::size_t i = 0; i < entries.size(); ++i) {
        if (entries[i].call) {
            recorder.entries |= std::uint32_t{1} << i;
        }
    }
}

bool IsRegularFile(std::string const& path) {
    struct stat status = {};
    return stat(path.c_str(), &status) == 0 && S_ISREG(status.st_mode);
}

} // namespace

Provider::Provider(std::string path, Kind kind) : _library(nullptr) {
    // libtslauth opens nothing else either.
    if (!IsRegularFile(path)) {
        _failure = path + " is not a regular file";
        return;
    }
    (void)dlerror();
    _library = dlopen(path.c_str(), Flags(kind));
    if (_library == nullptr) {
        _failure = dlerror();
    }
}

Provider::~Provider() {
    Close();
}

void Provider::Close() {
    if (_library != nullptr) {
        (void)dlclose(_library); // as libtslauth, which could do nothing about it
        _library = nullptr;
    }
}

void* Provider::Find(char const* symbol) const {
    return dlsym(_library, symbol);
}

ActiveDirectoryClientMetadataRecord const* Provider::Metadata() const {
    return static_cast<ActiveDirectoryClientMetadataRecord const*>(Find(metadataSymbol));
}

ActiveDirectoryClientOperationsRecord const* Provider::Operations() const {
    return static_cast<ActiveDirectoryClientOperationsRecord const*>(Find(operationsSymbol));
}

CAMProxyClientOperationsRecord const* Provider::CAMOperations() const {
    return static_cast<CAMProxyClientOperationsRecord const*>(Find(camSymbol));
}

decltype(&ActiveDirectoryClientLastFailure) Provider::LastFailure() const {
    return reinterpret_cast<decltype(&ActiveDirectoryClientLastFailure)>(
        Find("ActiveDirectoryClientLastFailure"));
}

std::size_t Provider::SizeOf(char const* symbol) const {
    Dl_info information = {};
    void* found = nullptr;
    if (dladdr1(Find(symbol), &information, &found, RTLD_DL_SYMENT) == 0 || found == nullptr) {
        return 0;
    }
    return static_cast<ElfW(Sym) const*>(found)->st_size;
}

void LookAtRecords(std::string const& path, Recorder& recorder) {
    std::size_t const threads = ProcessState::Threads();
    recorder.Begin("opening it");
    Provider const provider(path, Kind::Unknown);
    recorder.End();
    if (ProcessState::Threads() > threads) {
        recorder.Found(Rule::Loads, "a thread runs as soon as it is opened");
    }
    recorder.Examined(Rule::Loads);
    if (!provider.IsOpen()) {
        recorder.Found(Rule::Loads, "%s", provider.Failure().c_str());
        return;
    }
    auto const metadata = provider.Metadata();
    auto const operations = provider.Operations();
    auto const cam = provider.CAMOperations();
    recorder.Examined(Rule::Records);
    if (cam != nullptr && metadata == nullptr && operations == nullptr) {
        if (IsWhole(provider, camSymbol, sizeof *cam, recorder)) {
            NoteEntries(provider, Kind::CAM, recorder);
        }
        return;
    }
    if (metadata == nullptr) {
        recorder.Found(Rule::Records, "%s, or %s of a CAM provider, is missing", metadataSymbol,
                       camSymbol);
    } else if (IsWhole(provider, metadataSymbol, sizeof *metadata, recorder)) {
        LookAtMetadata(*metadata, recorder);
    }
    if (operations == nullptr) {
        recorder.Found(Rule::Records, "%s is missing", operationsSymbol);
    } else if (IsWhole(provider, operationsSymbol, sizeof *operations, recorder)) {
        LookAtOperations(*operations, recorder);
        if (metadata != nullptr) {
            NoteEntries(provider, Kind::Directory, recorder);
        }
    }
}

} // namespace tessel::providercheck
