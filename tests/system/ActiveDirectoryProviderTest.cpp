// SPDX-License-Identifier: Apache-2.0
#include "Failure.h"
#include "LoadedProvider.h"
#include "MappedCodes.h"
#include "Node.h"
#include "providers/Recording.h"

#include <tslauth/ActiveDirectoryProvider.h>
#include <tslauth/Exceptions.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <dirent.h>
#include <dlfcn.h>
#include <fstream>
#include <functional>
#include <memory>
#include <new>
#include <set>
#include <sys/stat.h>
#include <thread>
#include <typeindex>
#include <typeinfo>
#include <unistd.h>

using namespace tessel::authentication;
using testing::ElementsAre;
using testing::IsEmpty;

namespace {

/// While it is set, this program's next allocations fail, the library's included.
thread_local bool memoryIsExhausted = false;

} // namespace

void* operator new(std::size_t size) {
    void* const memory = memoryIsExhausted ? nullptr : std::malloc(size);
    if (memory == nullptr) {
        throw std::bad_alloc();
    }
    return memory;
}

void operator delete(void* memory) noexcept {
    std::free(memory);
}

void operator delete(void* memory, std::size_t /*size*/) noexcept {
    std::free(memory);
}

namespace {

constexpr char folder[] = "/usr/libexec/tslauth";

std::string PathOf(std::string const& name) {
    return LoadedProvider::PathOf(name);
}

bool IsLoaded(std::string const& name) {
    return LoadedProvider::IsLoaded(name);
}

Failure LoadingOf(std::string const& name) {
    return FailureOf([&] { ActiveDirectoryProvider const provider(name); });
}

Failure Unopened(std::string const& loaderText) {
    return {typeid(IOError), 0, "Unable to open provider: " + loaderText};
}

Failure Invalid(std::string const& name, std::string const& reason) {
    return {typeid(InvalidActiveDirectoryProviderException), 0,
            "The specified Active Directory provider '" + name + "' is invalid: " + reason};
}

Credentials const credentials = {"user", "password"};
CAM::ActiveDirectoryDomainInfo const domainInfo = {"d1", "d2", "d3", "d4"};
CAM::MachineAccountInfo const account = {"a1", "a2", "a3", "a4", "a5"};

/// Every operation that calls an entry: the entry's place in the record, and one call.
struct Operation {
    char const* name;
    unsigned entry;
    bool returnsCode;
    bool isOfVersion2;
    std::function<void(ActiveDirectoryProvider const&)> call;
};

Operation const operations[] = {
    {"JoinDomain", 2, true, false,
     [](auto const& provider) { provider.JoinDomain("domain", "unit", credentials); }},
    {"PartDomain", 3, true, false, [](auto const& provider) { provider.PartDomain(); }},
    {"PartDomainWithCredentials", 3, true, false,
     [](auto const& provider) { provider.PartDomain(credentials); }},
    {"GetActiveDomain", 4, true, false, [](auto const& provider) { provider.GetActiveDomain(); }},
    {"SetPreferredDomainControllers", 5, true, false,
     [](auto const& provider) {
         provider.SetPreferredDomainControllers({"a", "b"});
     }},
    {"GetPreferredDomainControllers", 6, true, false,
     [](auto const& provider) { provider.GetPreferredDomainControllers(); }},
    {"GetDomainTrustState", 8, false, false,
     [](auto const& provider) { provider.GetDomainTrustState(); }},
    {"GetTrustedDomains", 9, true, false,
     [](auto const& provider) { provider.GetTrustedDomains(); }},
    {"GetMachineAccountDN", 10, true, false,
     [](auto const& provider) { provider.GetMachineAccountDN(); }},
    {"GetAnyDomainController", 11, true, false,
     [](auto const& provider) { provider.GetAnyDomainController("", "domain"); }},
    {"ConvertCanonicalUsername", 12, true, false,
     [](auto const& provider) { provider.ConvertCanonicalUsername("name"); }},
    {"JoinDomainWithMachineAccount", 13, true, true,
     [](auto const& provider) { provider.JoinDomainWithMachineAccount(domainInfo, account); }},
    {"GetHostPrincipalForDomain", 14, true, true,
     [](auto const& provider) { provider.GetHostPrincipalForDomain("domain"); }},
    {"GetDomainTrustRelationship", 15, false, false,
     [](auto const& provider) { provider.GetDomainTrustRelationship("domain"); }},
};

class ActiveDirectoryProviderTest : public testing::Test {};

/// With a provider loaded that writes down what reaches it.
class RecordedProviderTest : public ActiveDirectoryProviderTest {
protected:
    void SetUp() override {
        Load("recording");
    }

    void TearDown() override {
        Unload();
    }

    void Load(std::string const& name) {
        Unload();
        _provider = std::make_unique<ActiveDirectoryProvider>(name);
        _handle = dlopen(PathOf(name).c_str(), RTLD_LAZY | RTLD_NOLOAD);
        ASSERT_NE(nullptr, _handle);
        _recording = static_cast<Recording*>(dlsym(_handle, "recording"));
        ASSERT_NE(nullptr, _recording);
    }

    ActiveDirectoryProvider const& Provider() const {
        return *_provider;
    }

    Recording& Record() const {
        return *_recording;
    }

    /// The texts that the last call handed over; a null one shows as "(null)".
    std::vector<std::string> Arguments() const {
        std::vector<std::string> arguments;
        for (unsigned i = 0; i < _recording->argumentCount; ++i) {
            arguments.push_back(_recording->isNull[i] != 0 ? "(null)" : _recording->arguments[i]);
        }
        return arguments;
    }

    std::vector<void*> Released() const {
        // In round brackets: braces would make a list of the two pointers.
        return std::vector<void*>(_recording->released,
                                  _recording->released + _recording->releases);
    }

    std::vector<unsigned> Calls() const {
        return {_recording->calls, _recording->calls + RECORDING_ENTRIES};
    }

    /// All results filled with texts that are too long to be kept inside a string object.
    void FillResults() {
        _recording->text = _text;
        _recording->domain = {_text, _otherText};
        _recording->names = _names;
        _recording->domains = _domains;
    }

    char _text[48] = "a result that is longer than a short string";
    char _otherText[48] = "another that is longer than a short string";
    char* _names[3] = {_text, _otherText, nullptr};
    ActiveDirectoryClientDomain _first = {_text, _otherText};
    ActiveDirectoryClientDomain _second = {"b.example", "B"};
    ActiveDirectoryClientDomain* _domains[3] = {&_first, &_second, nullptr};

private:
    void Unload() {
        _provider.reset();
        if (_handle != nullptr) {
            (void)dlclose(_handle); // counted by Load
            _handle = nullptr;
        }
    }

    std::unique_ptr<ActiveDirectoryProvider> _provider;
    void* _handle = nullptr;
    Recording* _recording = nullptr;
};

} // namespace

// ---- Loading ------------------------------------------------------------------------------------

// A provider that is added gets a test, here or in the test of what it was made for.
TEST_F(ActiveDirectoryProviderTest, EveryTestProviderIsKnownHere) {
    std::set<std::string> found;
    std::unique_ptr<DIR, int (*)(DIR*)> const directory(opendir(folder), &closedir);
    ASSERT_NE(nullptr, directory);
    while (dirent const* const entry = readdir(directory.get())) {
        std::string const name = entry->d_name;
        if (name[0] != '.') {
            found.insert(name);
        }
    }
    EXPECT_EQ((std::set<std::string>{
                  "lib.so",
                  "libblank-parameters.so",
                  "libcam-lazy.so",
                  "libcam-missing-operations.so",
                  "libcam-null-entries.so",
                  "libcam-recording.so",
                  "libconstant.so",
                  "libdirected.so",
                  "liberratic.so",
                  "libexample-cam.so",
                  "libexample.so",
                  "libgate.so",
                  "liblazy.so",
                  "liblong-names.so",
                  "libmissing-metadata.so",
                  "libmissing-operations.so",
                  "libno-parameters.so",
                  "libnot-a-library.so",
                  "libnull-entries.so",
                  "libnull-free-function.so",
                  "libnull-symbol.so",
                  "libold-metadata.so",
                  "libold-operations.so",
                  "libplain.so",
                  "librecording.so",
                  "librendezvous.so",
                  "libscripted.so",
                  "libtoo-new.so",
                  "libversion-0.so",
                  "libversion-1.so",
                  "libversion-negative.so",
                  "libwinbind-cam.so",
                  "libwinbind.so",
                  "libwords.so",
              }),
              found);
}

TEST_F(ActiveDirectoryProviderTest, AMissingLibraryIsAnIOErrorWithTheLoadersText) {
    EXPECT_EQ(Unopened("/usr/libexec/tslauth/libabsent.so: cannot open shared object file: No such "
                       "file or directory"),
              LoadingOf("absent"));
}

TEST_F(ActiveDirectoryProviderTest, AnErrorThatSomebodyElseLeftIsNotReported) {
    EXPECT_EQ(nullptr, dlopen("/nowhere/libelse.so", RTLD_LAZY));
    EXPECT_EQ(Unopened("/usr/libexec/tslauth/libabsent.so: cannot open shared object file: No such "
                       "file or directory"),
              LoadingOf("absent"));
    EXPECT_EQ(nullptr, dlopen("/nowhere/libelse.so", RTLD_LAZY));
    EXPECT_EQ(Invalid("missing-metadata", PathOf("missing-metadata") +
                                              ": undefined symbol: ActiveDirectoryClientMetadata"),
              LoadingOf("missing-metadata"));
}

TEST_F(ActiveDirectoryProviderTest, AFileThatIsNoLibraryIsAnIOErrorWithTheLoadersText) {
    EXPECT_EQ(Unopened("/usr/libexec/tslauth/libnot-a-library.so: invalid ELF header"),
              LoadingOf("not-a-library"));
}

TEST_F(ActiveDirectoryProviderTest, AnEmptyFileIsAnIOErrorWithTheLoadersText) {
    std::string const path = PathOf("empty-file");
    std::ofstream(path).close();
    EXPECT_EQ(Unopened(path + ": file too short"), LoadingOf("empty-file"));
    EXPECT_EQ(0, unlink(path.c_str()));
}

TEST_F(ActiveDirectoryProviderTest, AFolderIsAnIOErrorWithTheLoadersText) {
    std::string const path = PathOf("folder");
    ASSERT_EQ(0, mkdir(path.c_str(), 0755));
    EXPECT_EQ(Unopened(path + ": cannot read file data: Is a directory"), LoadingOf("folder"));
    EXPECT_EQ(0, rmdir(path.c_str()));
}

TEST_F(ActiveDirectoryProviderTest, ACutOffLibraryIsAnIOError) {
    std::string const path = PathOf("cut-off");
    std::ifstream whole(PathOf("words"), std::ios::binary);
    std::string head(200, '\0');
    ASSERT_TRUE(whole.read(&head[0], 200));
    std::ofstream(path, std::ios::binary) << head;
    Failure const failure = LoadingOf("cut-off");
    EXPECT_EQ(std::type_index(typeid(IOError)), failure.type);
    EXPECT_EQ(0U, failure.code);
    EXPECT_EQ(0U, failure.message.find("Unable to open provider: " + path + ": "))
        << failure.message;
    EXPECT_EQ(0, unlink(path.c_str()));
}

TEST_F(ActiveDirectoryProviderTest, AnEmptyNameLoadsTheFileLibSo) {
    ActiveDirectoryProvider const provider("");
    EXPECT_TRUE(IsLoaded(""));
    EXPECT_THAT(provider.PAMModuleParameters(), ElementsAre("empty", "name"));
}

TEST_F(ActiveDirectoryProviderTest, AProviderWithoutMetadataIsInvalidAndUnloaded) {
    EXPECT_EQ(Invalid("missing-metadata", PathOf("missing-metadata") +
                                              ": undefined symbol: ActiveDirectoryClientMetadata"),
              LoadingOf("missing-metadata"));
    EXPECT_FALSE(IsLoaded("missing-metadata"));
}

TEST_F(ActiveDirectoryProviderTest, AProviderWithoutOperationsIsInvalidAndUnloaded) {
    EXPECT_EQ(
        Invalid("missing-operations", PathOf("missing-operations") +
                                          ": undefined symbol: ActiveDirectoryClientOperations"),
        LoadingOf("missing-operations"));
    EXPECT_FALSE(IsLoaded("missing-operations"));
}

TEST_F(ActiveDirectoryProviderTest, ASymbolWithoutAnAddressIsMissingToo) {
    EXPECT_EQ(Invalid("null-symbol", "the symbol has no address"), LoadingOf("null-symbol"));
    EXPECT_FALSE(IsLoaded("null-symbol"));
}

TEST_F(ActiveDirectoryProviderTest, AProviderThatIsTooNewIsInvalidAndUnloaded) {
    EXPECT_EQ(
        Invalid("too-new", "The API version (3) is not supported by this version of libtslauth"),
        LoadingOf("too-new"));
    EXPECT_FALSE(IsLoaded("too-new"));
}

TEST_F(ActiveDirectoryProviderTest, EveryVersionUpToTwoIsAccepted) {
    EXPECT_EQ(2, ActiveDirectoryProvider("null-entries").GetAPIVersion());
    EXPECT_EQ(1, ActiveDirectoryProvider("version-1").GetAPIVersion());
    EXPECT_EQ(0, ActiveDirectoryProvider("version-0").GetAPIVersion());
    EXPECT_EQ(-1, ActiveDirectoryProvider("version-negative").GetAPIVersion());
}

TEST_F(ActiveDirectoryProviderTest, TheAPIVersionIsThatOfTheOperations) {
    EXPECT_EQ(1, ActiveDirectoryProvider("old-operations").GetAPIVersion());
    EXPECT_EQ(2, ActiveDirectoryProvider("old-metadata").GetAPIVersion());
}

TEST_F(ActiveDirectoryProviderTest, TheLibraryStaysLoadedAsLongAsTheAdapterLives) {
    EXPECT_FALSE(IsLoaded("words"));
    {
        ActiveDirectoryProvider const first("words");
        EXPECT_TRUE(IsLoaded("words"));
        { ActiveDirectoryProvider const second("words"); }
        EXPECT_TRUE(IsLoaded("words"));
    }
    EXPECT_FALSE(IsLoaded("words"));
}

TEST_F(ActiveDirectoryProviderTest, FunctionsAreBoundWhenTheyAreCalledFirst) {
    EXPECT_EQ(2, ActiveDirectoryProvider("lazy").GetAPIVersion());
}

TEST_F(ActiveDirectoryProviderTest, ItsSymbolsStayItsOwn) {
    ActiveDirectoryProvider const provider("words");
    EXPECT_EQ(nullptr, dlsym(RTLD_DEFAULT, "ActiveDirectoryClientMetadata"));
}

TEST_F(ActiveDirectoryProviderTest, ModuleNamesAreTakenVerbatim) {
    ActiveDirectoryProvider const provider("recording");
    EXPECT_EQ("pam_recording.so", provider.PAMModule());
    EXPECT_THAT(provider.PAMModuleParameters(), ElementsAre("first=1", "second"));
    EXPECT_EQ("recording", provider.NSSModule());
    EXPECT_THAT(provider.NSSModuleParameters(), ElementsAre("third"));
}

TEST_F(ActiveDirectoryProviderTest, ParametersAreSplitAtRunsOfWhiteSpace) {
    ActiveDirectoryProvider const provider("words");
    EXPECT_THAT(provider.PAMModuleParameters(), ElementsAre("a", "b", "c"));
    EXPECT_THAT(provider.NSSModuleParameters(), ElementsAre("a", "b", "c"));
}

TEST_F(ActiveDirectoryProviderTest, NullOrBlankParametersAreNone) {
    for (char const* const name : {"no-parameters", "blank-parameters"}) {
        ActiveDirectoryProvider const provider(name);
        EXPECT_THAT(provider.PAMModuleParameters(), IsEmpty()) << name;
        EXPECT_THAT(provider.NSSModuleParameters(), IsEmpty()) << name;
    }
}

TEST_F(ActiveDirectoryProviderTest, ALibraryIsUnloadedWhenMemoryRunsOutDuringLoading) {
    std::string const name = "words";
    memoryIsExhausted = true;
    try {
        ActiveDirectoryProvider const provider(name);
        memoryIsExhausted = false;
        ADD_FAILURE() << "loaded without memory";
    } catch (std::bad_alloc const&) {
        memoryIsExhausted = false;
    }
    EXPECT_FALSE(IsLoaded(name));
}

// ---- Every operation, entry by entry ------------------------------------------------------------

TEST_F(ActiveDirectoryProviderTest, EveryNullEntryIsNotImplemented) {
    for (char const* const name : {"null-entries", "version-negative", "version-0", "version-1"}) {
        ActiveDirectoryProvider const provider(name);
        for (Operation const& operation : operations) {
            EXPECT_EQ(NotImplemented(), FailureOf([&] { operation.call(provider); }))
                << name << ' ' << operation.name;
        }
    }
}

TEST_F(RecordedProviderTest, EveryOperationCallsItsOwnEntryOnceAndNoOther) {
    std::set<unsigned> entries;
    for (Operation const& operation : operations) {
        std::vector<unsigned> expected = Calls();
        ++expected[operation.entry];
        operation.call(Provider());
        EXPECT_EQ(expected, Calls()) << operation.name;
        entries.insert(operation.entry);
    }
    EXPECT_EQ((std::set<unsigned>{2, 3, 4, 5, 6, 8, 9, 10, 11, 12, 13, 14, 15}), entries);
    EXPECT_EQ(0U, Record().calls[7]) << "the unused entry";
}

TEST_F(RecordedProviderTest, SlotsAreNullWhenAnEntryIsCalled) {
    FillResults();
    for (Operation const& operation : operations) {
        Record().slotsWereNull = -1;
        operation.call(Provider());
        EXPECT_NE(0, Record().slotsWereNull) << operation.name;
    }
}

TEST_F(RecordedProviderTest, EveryMappedCodeBecomesItsExceptionFromEveryOperation) {
    FillResults();
    for (Operation const& operation : operations) {
#define ROW(mapped, Class, text)                                                                   \
    Record().code = mapped;                                                                        \
    EXPECT_EQ(operation.returnsCode ? Coded(typeid(Class), mapped, text)                           \
                                    : Failure({typeid(void), 0, "(none)"}),                        \
              FailureOf([&] { operation.call(Provider()); }))                                      \
        << operation.name;
        TSLAUTH_MAPPED_CODES(ROW)
#undef ROW
    }
    EXPECT_EQ(0U, Record().releases) << "a provider that fails has handed out nothing";
}

TEST_F(RecordedProviderTest, EveryOtherCodeBecomesUnknownFromEveryOperation) {
    FillResults();
    for (unsigned const code : {1U, 3U, 121U, 10061U, 0x12345678U, 0x7fffffffU, 0x80000000U,
                                0xffff0000U, 0xffff0001U, 0xffffffffU}) {
        Record().code = static_cast<int>(code);
        for (Operation const& operation : operations) {
            if (operation.returnsCode) {
                EXPECT_EQ(Coded(typeid(UnknownException), code, "Unknown exception"),
                          FailureOf([&] { operation.call(Provider()); }))
                    << operation.name;
            }
        }
    }
    EXPECT_EQ(0U, Record().releases) << "a provider that fails has handed out nothing";
}

TEST_F(RecordedProviderTest, ANegativeCodeIsTheUnsignedNumberInEveryWordSize) {
    Record().code = -2;
    Failure const failure = FailureOf([&] { Provider().PartDomain(); });
    EXPECT_EQ(4294967294UL, failure.code);
    EXPECT_EQ("Exception 0xfffffffe: Unknown exception", failure.message);
}

TEST_F(RecordedProviderTest, MemoryIsReleasedAlsoWhenThereIsNoneToCopyItTo) {
    FillResults();
    struct Case {
        unsigned entry;
        std::vector<void*> released;
    };
    Case const cases[] = {
        {4, {_text, _otherText}},
        {6, {_names}},
        {9, {_domains}},
        {10, {_text}},
        {11, {_text}},
        {12, {_text}},
        {14, {_text}},
    };
    for (Operation const& operation : operations) {
        for (Case const& expected : cases) {
            if (expected.entry == operation.entry) {
                Record().releases = 0;
                bool exhausted = false;
                memoryIsExhausted = true;
                try {
                    operation.call(Provider());
                } catch (std::bad_alloc const&) {
                    exhausted = true;
                }
                memoryIsExhausted = false;
                EXPECT_TRUE(exhausted) << operation.name;
                EXPECT_EQ(expected.released, Released()) << operation.name;
            }
        }
    }
}

TEST_F(RecordedProviderTest, AFreeFunctionThatIsNullIsNotCalled) {
    Load("null-free-function");
    FillResults();
    EXPECT_EQ(Domain(_text, _otherText), Provider().GetActiveDomain());
    EXPECT_THAT(Provider().GetPreferredDomainControllers(), ElementsAre(_text, _otherText));
    EXPECT_THAT(Provider().GetTrustedDomains(),
                ElementsAre(Domain(_text, _otherText), Domain("b.example", "B")));
    EXPECT_EQ(_text, Provider().GetMachineAccountDN());
    EXPECT_EQ(_text, Provider().GetAnyDomainController("", "domain"));
    EXPECT_EQ(_text, Provider().ConvertCanonicalUsername("name"));
    EXPECT_EQ(_text, Provider().GetHostPrincipalForDomain("domain"));
}

// ---- Joining and parting ------------------------------------------------------------------------

TEST_F(RecordedProviderTest, JoinDomainPassesDomainUnitAndTheCredentialsThemselves) {
    Provider().JoinDomain("corp.example", "Servers/Linux", credentials);
    EXPECT_THAT(Arguments(), ElementsAre("corp.example", "Servers/Linux", "user", "password"));
    EXPECT_EQ(&credentials, Record().credentials);
}

TEST_F(RecordedProviderTest, JoinDomainPassesNullForAnEmptyUnitOnly) {
    Provider().JoinDomain("", "", {"", ""});
    EXPECT_THAT(Arguments(), ElementsAre("", "(null)", "", ""));
}

TEST_F(RecordedProviderTest, NullCredentialTextsStayNull) {
    Provider().JoinDomain("corp.example", "", {nullptr, nullptr});
    EXPECT_THAT(Arguments(), ElementsAre("corp.example", "(null)", "(null)", "(null)"));
}

TEST_F(RecordedProviderTest, PartDomainPassesNoCredentialsOrThoseGiven) {
    Provider().PartDomain(credentials);
    EXPECT_EQ(&credentials, Record().credentials);
    EXPECT_THAT(Arguments(), ElementsAre("user", "password"));
    Provider().PartDomain();
    EXPECT_EQ(nullptr, Record().credentials);
}

TEST_F(RecordedProviderTest, JoiningWithAMachineAccountPassesAllTextsInOrder) {
    Provider().JoinDomainWithMachineAccount(domainInfo, account);
    EXPECT_THAT(Arguments(), ElementsAre("d1", "d2", "d3", "d4", "a1", "a2", "a3", "a4", "a5"));
    Provider().JoinDomainWithMachineAccount({}, {});
    EXPECT_THAT(Arguments(), ElementsAre("", "", "", "", "", "", "", "", ""));
}

TEST_F(RecordedProviderTest, AnOldOperationsRecordJoinsAndPartsButNotWithMachineAccounts) {
    Load("old-operations");
    Provider().JoinDomain("corp.example", "", credentials);
    Provider().PartDomain();
    EXPECT_EQ(1U, Record().calls[2]);
    EXPECT_EQ(1U, Record().calls[3]);
    for (Operation const& operation : operations) {
        EXPECT_EQ(operation.isOfVersion2 ? NotImplemented() : Failure({typeid(void), 0, "(none)"}),
                  FailureOf([&] { operation.call(Provider()); }))
            << operation.name;
    }
    EXPECT_EQ(0U, Record().calls[13]);
    EXPECT_EQ(0U, Record().calls[14]);
}

TEST_F(RecordedProviderTest, OldMetadataDoNotHideNewOperations) {
    Load("old-metadata");
    Provider().JoinDomainWithMachineAccount(domainInfo, account);
    Provider().GetHostPrincipalForDomain("domain");
    EXPECT_EQ(1U, Record().calls[13]);
    EXPECT_EQ(1U, Record().calls[14]);
}

// ---- Domains ------------------------------------------------------------------------------------

TEST_F(RecordedProviderTest, GetActiveDomainReleasesBothNamesOneByOne) {
    Record().domain = {_text, _otherText};
    EXPECT_EQ(Domain(_text, _otherText), Provider().GetActiveDomain());
    EXPECT_THAT(Released(), ElementsAre(_text, _otherText));
}

TEST_F(RecordedProviderTest, GetActiveDomainWithoutANetBIOSNameReleasesTheDNSNameAlone) {
    Record().domain = {_text, nullptr};
    EXPECT_EQ(Domain(_text, ""), Provider().GetActiveDomain());
    EXPECT_THAT(Released(), ElementsAre(_text));
}

TEST_F(RecordedProviderTest, GetActiveDomainWithoutADNSNameReleasesTheNetBIOSNameAlone) {
    Record().domain = {nullptr, _otherText};
    EXPECT_EQ(Domain("", _otherText), Provider().GetActiveDomain());
    EXPECT_THAT(Released(), ElementsAre(_otherText));
}

TEST_F(RecordedProviderTest, GetActiveDomainWithoutNamesReleasesNothing) {
    EXPECT_EQ(Domain(), Provider().GetActiveDomain());
    EXPECT_THAT(Released(), IsEmpty());
}

TEST_F(RecordedProviderTest, GetTrustedDomainsKeepsTheOrderAndReleasesTheArrayOnce) {
    Record().domains = _domains;
    EXPECT_THAT(Provider().GetTrustedDomains(),
                ElementsAre(Domain(_text, _otherText), Domain("b.example", "B")));
    EXPECT_THAT(Released(), ElementsAre(_domains));
}

TEST_F(RecordedProviderTest, GetTrustedDomainsOfAnEmptyArrayReleasesItOnce) {
    ActiveDirectoryClientDomain* none[] = {nullptr};
    Record().domains = none;
    EXPECT_THAT(Provider().GetTrustedDomains(), IsEmpty());
    EXPECT_THAT(Released(), ElementsAre(none));
}

TEST_F(RecordedProviderTest, GetTrustedDomainsOfANullArrayReleasesItOnce) {
    EXPECT_THAT(Provider().GetTrustedDomains(), IsEmpty());
    EXPECT_THAT(Released(), ElementsAre(nullptr));
}

TEST_F(RecordedProviderTest, TrustStateAndRelationshipAreNeverMapped) {
    for (int const value : {0, 1, 7, 5, 120, 1326, -1, -2147483647 - 1, 2147483647}) {
        Record().value = value;
        EXPECT_EQ(value, Provider().GetDomainTrustState());
        EXPECT_EQ(value, Provider().GetDomainTrustRelationship("corp.example"));
        EXPECT_THAT(Arguments(), ElementsAre("corp.example"));
    }
}

// ---- Domain controllers -------------------------------------------------------------------------

TEST_F(RecordedProviderTest, SetPreferredDomainControllersPassesTheVeryStringsInOrder) {
    std::deque<std::string> const controllers = {"dc2.corp.example", "", "dc1.corp.example"};
    Provider().SetPreferredDomainControllers(controllers);
    EXPECT_THAT(Arguments(), ElementsAre("dc2.corp.example", "", "dc1.corp.example"));
    EXPECT_EQ(controllers[0].c_str(), Record().firstArgument);
}

TEST_F(RecordedProviderTest, SetPreferredDomainControllersOfNoneIsTheTerminatorAlone) {
    Provider().SetPreferredDomainControllers({});
    EXPECT_EQ(1U, Record().calls[5]);
    EXPECT_THAT(Arguments(), IsEmpty());
}

TEST_F(RecordedProviderTest, GetPreferredDomainControllersReleasesTheArrayAlone) {
    Record().names = _names;
    EXPECT_THAT(Provider().GetPreferredDomainControllers(), ElementsAre(_text, _otherText));
    EXPECT_THAT(Released(), ElementsAre(_names));
}

TEST_F(RecordedProviderTest, GetPreferredDomainControllersOfAnEmptyArrayReleasesItOnce) {
    char* none[] = {nullptr};
    Record().names = none;
    EXPECT_THAT(Provider().GetPreferredDomainControllers(), IsEmpty());
    EXPECT_THAT(Released(), ElementsAre(none));
}

TEST_F(RecordedProviderTest, GetPreferredDomainControllersOfANullArrayReleasesItOnce) {
    EXPECT_THAT(Provider().GetPreferredDomainControllers(), IsEmpty());
    EXPECT_THAT(Released(), ElementsAre(nullptr));
}

TEST_F(RecordedProviderTest, GetAnyDomainControllerPassesNullForAnEmptyFirstTextOnly) {
    Provider().GetAnyDomainController("", "corp.example");
    EXPECT_THAT(Arguments(), ElementsAre("(null)", "corp.example"));
    Provider().GetAnyDomainController("site", "");
    EXPECT_THAT(Arguments(), ElementsAre("site", ""));
}

// ---- Single texts -------------------------------------------------------------------------------

TEST_F(RecordedProviderTest, ATextIsCopiedAndReleasedOnce) {
    std::function<std::string()> const calls[] = {
        [&] { return Provider().GetMachineAccountDN(); },
        [&] { return Provider().GetAnyDomainController("", "domain"); },
        [&] { return Provider().ConvertCanonicalUsername("name"); },
        [&] { return Provider().GetHostPrincipalForDomain("domain"); },
    };
    for (auto const& call : calls) {
        Record().text = _text;
        Record().releases = 0;
        EXPECT_EQ(_text, call());
        EXPECT_THAT(Released(), ElementsAre(_text));
    }
    for (auto const& call : calls) {
        Record().text = nullptr;
        Record().releases = 0;
        EXPECT_EQ("", call());
        EXPECT_THAT(Released(), IsEmpty()) << "a null text is not given to the free function";
    }
}

TEST_F(RecordedProviderTest, NamesArePassedAsTheyAre) {
    Provider().ConvertCanonicalUsername("CORP\\user name");
    EXPECT_THAT(Arguments(), ElementsAre("CORP\\user name"));
    Provider().GetHostPrincipalForDomain("corp.example");
    EXPECT_THAT(Arguments(), ElementsAre("corp.example"));
}

// ---- Threads ------------------------------------------------------------------------------------

TEST_F(ActiveDirectoryProviderTest, OperationsRunAtOnceOnSeveralThreads) {
    ActiveDirectoryProvider const provider("rendezvous");
    int other = 0;
    std::thread thread([&] { other = provider.GetDomainTrustState(); });
    int const own = provider.GetDomainTrustState();
    thread.join();
    EXPECT_EQ(2, own);
    EXPECT_EQ(2, other);
}

// ---- The example provider -----------------------------------------------------------------------

namespace {

class ExampleProviderTest : public ActiveDirectoryProviderTest {
protected:
    void SetUp() override {
        ASSERT_EQ(0, std::system("rm -rf /etc/tslauth-example /var/lib/tslauth-example && "
                                 "mkdir /etc/tslauth-example && cd /etc/tslauth-example && "
                                 "echo joiner:secret > accounts && "
                                 "echo 'node01:machine secret' >> accounts && "
                                 "echo 'alice:*' > passwords"));
        ASSERT_EQ(0, sethostname("node01.example.test", 19));
        _provider = std::make_unique<ActiveDirectoryProvider>("example");
    }

    void Join(std::string const& domain = "example.test") {
        _provider->JoinDomain(domain, "", {"joiner", "secret"});
    }

    template <typename Call> unsigned long CodeOf(Call call) {
        return FailureOf([&] { call(*_provider); }).code;
    }

    std::unique_ptr<ActiveDirectoryProvider> _provider;
};

} // namespace

TEST_F(ExampleProviderTest, NamesTheModulesThatDebianShips) {
    EXPECT_EQ("pam_pwdfile.so", _provider->PAMModule());
    EXPECT_THAT(_provider->PAMModuleParameters(),
                ElementsAre("pwdfile=/etc/tslauth-example/passwords"));
    EXPECT_EQ("extrausers", _provider->NSSModule());
    EXPECT_THAT(_provider->NSSModuleParameters(), IsEmpty());
    EXPECT_EQ(2, _provider->GetAPIVersion());
}

TEST_F(ExampleProviderTest, ImplementsEveryOperation) {
    for (Operation const& operation : operations) {
        EXPECT_NE(120U, FailureOf([&] { operation.call(*_provider); }).code) << operation.name;
    }
}

TEST_F(ExampleProviderTest, JoinsItsDomainAndRemembersIt) {
    EXPECT_EQ(Domain(), _provider->GetActiveDomain());
    EXPECT_EQ("", _provider->GetMachineAccountDN());
    EXPECT_THAT(_provider->GetTrustedDomains(), IsEmpty());
    EXPECT_EQ(TSLAUTH_PROVIDER_TRUST_NOT_JOINED, _provider->GetDomainTrustState());
    EXPECT_EQ(0, _provider->GetDomainTrustRelationship("example.test"));

    Join("Example.Test");
    _provider = std::make_unique<ActiveDirectoryProvider>("example");
    EXPECT_EQ(Domain("example.test", "EXAMPLE"), _provider->GetActiveDomain());
    EXPECT_EQ("CN=node01,CN=Computers,DC=example,DC=test", _provider->GetMachineAccountDN());
    EXPECT_THAT(_provider->GetTrustedDomains(), ElementsAre(Domain("example.test", "EXAMPLE")));
    EXPECT_EQ(TSLAUTH_PROVIDER_TRUST_IN_ORDER, _provider->GetDomainTrustState());
    EXPECT_EQ(1, _provider->GetDomainTrustRelationship("EXAMPLE"));
    EXPECT_EQ(0, _provider->GetDomainTrustRelationship("other.test"));
    EXPECT_EQ("host/node01@EXAMPLE.TEST", _provider->GetHostPrincipalForDomain("example.test"));

    _provider->PartDomain({"joiner", "secret"});
    EXPECT_EQ(Domain(), _provider->GetActiveDomain());
}

TEST_F(ExampleProviderTest, RefusesAJoinThatIsWrong) {
    EXPECT_EQ(1355U, CodeOf([&](auto const&) { Join("other.test"); }));
    EXPECT_EQ(2U, CodeOf([&](auto const& provider) {
                  provider.JoinDomain("example.test", "Servers", {"joiner", "secret"});
              }));
    Credentials const refused[] = {
        {"joiner", "wrong"}, {"joiner", "secre"},  {"joiner", "secret2"},
        {"joiner", ""},      {"nobody", "secret"}, {"", "joiner:secret"},
    };
    for (Credentials const& wrong : refused) {
        EXPECT_EQ(1326U, CodeOf([&](auto const& provider) {
                      provider.JoinDomain("example.test", "", wrong);
                  }))
            << wrong.userName << ' ' << wrong.password;
    }
    EXPECT_EQ(87U, CodeOf([&](auto const& provider) {
                  provider.JoinDomain("example.test", "", {nullptr, nullptr});
              }));
    EXPECT_EQ(Domain(), _provider->GetActiveDomain());
}

TEST_F(ExampleProviderTest, RefusesASecondJoinAndASecondParting) {
    Join();
    EXPECT_EQ(2691U, CodeOf([&](auto const&) { Join(); }));
    _provider->PartDomain();
    EXPECT_EQ(1355U, CodeOf([&](auto const& provider) { provider.PartDomain(); }));
    Join();
}

TEST_F(ExampleProviderTest, LeavesNoTemporaryFile) {
    Join();
    EXPECT_EQ(2691U, CodeOf([&](auto const&) { Join(); }));
    _provider->SetPreferredDomainControllers({"dc1"});
    EXPECT_EQ(0, std::system("test \"$(ls -A /var/lib/tslauth-example | tr '\\n' ' ')\" = "
                             "'controllers joined '"));
}

TEST_F(ExampleProviderTest, JoinsWithAMachineAccount) {
    CAM::MachineAccountInfo machine = {"node01", "example.test", "", "wrong", ""};
    CAM::ActiveDirectoryDomainInfo const other = {"", "OTHER", "other.test", ""};
    CAM::ActiveDirectoryDomainInfo const domain = {"", "EXAMPLE", "example.test", ""};
    auto const join = [&](auto const& provider) {
        provider.JoinDomainWithMachineAccount(domain, machine);
    };
    EXPECT_EQ(1326U, CodeOf(join));
    EXPECT_EQ(1355U, CodeOf([&](auto const& provider) {
                  provider.JoinDomainWithMachineAccount(other, machine);
              }));
    machine.firstResult = "machine secret";
    join(*_provider);
    EXPECT_EQ(Domain("example.test", "EXAMPLE"), _provider->GetActiveDomain());
    EXPECT_EQ(2691U, CodeOf(join));
}

TEST_F(ExampleProviderTest, OneOfManyJoinsAtOnceSucceeds) {
    std::vector<std::thread> threads;
    std::vector<unsigned long> codes(8, 1);
    for (unsigned long& code : codes) {
        threads.emplace_back([&] { code = CodeOf([&](auto const&) { Join(); }); });
    }
    for (std::thread& thread : threads) {
        thread.join();
    }
    EXPECT_EQ(1, std::count(codes.begin(), codes.end(), 0U));
    EXPECT_EQ(7, std::count(codes.begin(), codes.end(), 2691U));
}

TEST_F(ExampleProviderTest, KeepsThePreferredDomainControllersInOrder) {
    EXPECT_THAT(_provider->GetPreferredDomainControllers(), IsEmpty());
    EXPECT_EQ("node01", _provider->GetAnyDomainController("", "example.test"));
    _provider->SetPreferredDomainControllers({"dc2", "dc1"});
    EXPECT_THAT(_provider->GetPreferredDomainControllers(), ElementsAre("dc2", "dc1"));
    EXPECT_EQ("dc2", _provider->GetAnyDomainController("", "EXAMPLE"));
    _provider->SetPreferredDomainControllers({});
    EXPECT_THAT(_provider->GetPreferredDomainControllers(), IsEmpty());
    EXPECT_EQ("node01", _provider->GetAnyDomainController("", "example.test"));
    EXPECT_EQ(1355U, CodeOf([&](auto const& provider) {
                  provider.GetAnyDomainController("", "other.test");
              }));
    for (char const* const name : {"", "a\nb"}) {
        EXPECT_EQ(1210U, CodeOf([&](auto const& provider) {
                      provider.SetPreferredDomainControllers({name});
                  }));
    }
}

TEST_F(ExampleProviderTest, KnowsItsUsersByEveryFormOfTheirName) {
    for (char const* const name : {"alice", "EXAMPLE\\alice", "example.test\\alice",
                                   "alice@example.test", "alice@EXAMPLE"}) {
        EXPECT_EQ("alice", _provider->ConvertCanonicalUsername(name)) << name;
    }
    for (char const* const name : {"bob", "EXAMPLE\\bob", "alic", "alicee", ""}) {
        EXPECT_EQ(1317U,
                  CodeOf([&](auto const& provider) { provider.ConvertCanonicalUsername(name); }))
            << name;
    }
    for (char const* const name : {"OTHER\\alice", "alice@other.test", "alice@"}) {
        EXPECT_EQ(1355U,
                  CodeOf([&](auto const& provider) { provider.ConvertCanonicalUsername(name); }))
            << name;
    }
}

TEST_F(ExampleProviderTest, AnswersForTheJoinedDomainAlone) {
    auto const principal = [](auto const& provider) {
        provider.GetHostPrincipalForDomain("example.test");
    };
    EXPECT_EQ(1355U, CodeOf(principal));
    Join();
    EXPECT_EQ(0U, CodeOf(principal));
    EXPECT_EQ(1355U, CodeOf([&](auto const& provider) {
                  provider.GetHostPrincipalForDomain("other.test");
              }));
}

TEST_F(ExampleProviderTest, ItsTrustStateTellsAnUnreadableDirectory) {
    Join();
    ASSERT_EQ(0, unlink("/etc/tslauth-example/passwords"));
    EXPECT_EQ(2, _provider->GetDomainTrustState());
    EXPECT_EQ(2U, CodeOf([](auto const& provider) { provider.ConvertCanonicalUsername("alice"); }));
}

TEST_F(ExampleProviderTest, WithoutAccountsNobodyJoins) {
    ASSERT_EQ(0, unlink("/etc/tslauth-example/accounts"));
    EXPECT_EQ(1326U, CodeOf([&](auto const&) { Join(); }));
}

TEST_F(ExampleProviderTest, AnEmptyAccountsFileIsNoAccount) {
    std::ofstream("/etc/tslauth-example/accounts").close();
    EXPECT_EQ(1326U, CodeOf([&](auto const&) { Join(); }));
}
