// SPDX-License-Identifier: Apache-2.0
#include "CheckedProvider.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <ostream>
#include <utility>

namespace {

typedef std::set<std::string> Rules;

/// For providers whose calls change nothing, whatever they are called.
constexpr char profile[] = "seconds = \"2\"\nhost-may-change = \"yes\"\n";

CheckedProvider Checked(std::string const& folder, std::string const& name,
                        std::string const& text = profile) {
    return CheckedProvider(PROVIDER_CHECK, folder + "/lib" + name + ".so", text);
}

std::set<std::string> NamesIn(std::string const& folder) {
    std::set<std::string> names;
    for (auto const& file : std::filesystem::directory_iterator(folder)) {
        std::string const name = file.path().stem().string();
        if (file.path().extension() == ".so") {
            names.insert(name.substr(3));
        }
    }
    return names;
}

struct Expected {
    std::string provider;
    Rules broken;
    Rules sometimes = {}; ///< what follows from it, as it comes
};

std::vector<Expected> const& Broken() {
    static std::vector<Expected> const broken = {
        {"believes-everybody", {"joins"}},
        {"changes-process", {"process"}},
        {"crashes", {"crash"}},
        {"ends-badly", {"loads", "crash", "unloads", "threads", "cancelled", "forked"}},
        {"exits", {"exit"}},
        {"fails-with-a-result", {"slots"}},
        {"interrupted", {"signals"}},
        {"keeps-argument", {"arguments"}},
        {"keeps-lock", {"cancelled"}, {"forked"}},
        {"keeps-lock-in-child", {"forked"}},
        {"leaves-child", {"children"}},
        {"leaves-descriptor", {"descriptors"}},
        {"leaves-thread", {"loads", "threads-left"}},
        {"logs-secret", {"secrets"}},
        {"loses-memory", {"released-all"}},
        {"never-returns", {"time", "threads", "cancelled", "forked"}},
        {"no-end", {"results"}},
        {"no-module", {"metadata"}},
        {"null-names", {"results"}},
        {"odd-code", {"code"}},
        {"one-at-a-time", {"threads"}, {"cancelled", "forked"}},
        {"one-block", {"released-own"}},
        {"reads-beyond-argument", {"arguments"}},
        {"releases-twice", {"released-once"}},
        {"runs-argument", {"injection", "output"}},
        {"short-record", {"record-size"}},
        {"speaks", {"locale"}},
        {"static-result", {"results"}},
        {"talks", {"output"}},
        {"tells-secret", {"secrets"}},
        {"throws", {"exception"}},
        {"writes-after-release", {"overrun"}},
        {"writes-argument", {"arguments"}},
        {"writes-beyond", {"overrun"}},
    };
    return broken;
}

Rules Without(Rules const& sometimes, Rules broken) {
    for (std::string const& rule : sometimes) {
        broken.erase(rule);
    }
    return broken;
}

/// What was found, but for what comes and goes: a busy machine may take its time.
Rules Steady(Expected const& expected, Rules found) {
    if (expected.broken.count("time") == 0) {
        found.erase("time");
    }
    return Without(expected.sometimes, std::move(found));
}

void PrintTo(Expected const& expected, std::ostream* stream) {
    *stream << expected.provider;
}

/// Those that tests of the library load: most are odd, and some are broken.
std::vector<Expected> const& Loaded() {
    Rules const words = {"nss-parameters"};
    static std::vector<Expected> const loaded = {
        {"blank-parameters", {}},
        {"cam-lazy", {"exit", "output"}},
        {"cam-missing-operations", {"records"}},
        {"cam-null-entries", {}},
        {"cam-recording", {"results"}},
        {"constant", {}},
        {"directed", {}},
        {"erratic", {"slots"}, {"locale", "signals", "forked"}},
        {"gate", {}, {"forked"}},
        {"lazy", {"exit", "output"}},
        {"long-names", {}},
        {"missing-metadata", {"records"}},
        {"missing-operations", {"records", "nss-parameters"}},
        {"no-parameters", {}},
        {"not-a-library", {"loads"}},
        {"null-entries", words},
        {"null-free-function", {"nss-parameters", "unused"}},
        {"null-symbol", {"records"}},
        {"old-metadata", {"nss-parameters", "unused"}},
        {"old-operations", {"version", "nss-parameters", "unused"}},
        {"plain", {}},
        {"recording", {"nss-parameters", "unused"}},
        {"rendezvous", {"time", "cancelled"}, {"forked"}},
        {"scripted", {}, {"forked"}},
        {"too-new", {"version", "nss-parameters"}},
        {"version-0", words},
        {"version-1", words},
        {"version-negative", {"version", "nss-parameters"}},
        {"words", words},
    };
    return loaded;
}

class BrokenProvidersTest : public testing::TestWithParam<Expected> {};
class LoadedProvidersTest : public testing::TestWithParam<Expected> {};

std::string NameOf(testing::TestParamInfo<Expected> const& information) {
    std::string name = information.param.provider;
    for (char& character : name) {
        character = character == '-' ? '_' : character;
    }
    return name;
}

} // namespace

TEST_P(BrokenProvidersTest, FailsForItsReason) {
    std::string text = profile;
    TemporaryFolder const folder;
    if (GetParam().provider == "believes-everybody") {
        std::ofstream(folder / "password") << "right\n";
        text += "domain = \"broken.example\"\nuser = \"joiner\"\npassword-file = \"" +
                folder / "password" + "\"\n";
    }
    CheckedProvider const checked = Checked(BROKEN_PROVIDERS, GetParam().provider, text);
    EXPECT_EQ(1, checked.exitCode);
    if (SANITIZED != 0) {
        return; // it may come first, and says in its own words what is wrong
    }
    EXPECT_EQ(GetParam().broken, Steady(GetParam(), checked.broken)) << checked.tap;
}

INSTANTIATE_TEST_SUITE_P(Each, BrokenProvidersTest, testing::ValuesIn(Broken()), NameOf);

TEST_P(LoadedProvidersTest, KeepsToTheRulesItKeepsTo) {
    if (SANITIZED != 0) {
        GTEST_SKIP()
            << "a sanitizer's own words at the end of a child are taken for the provider's";
    }
    CheckedProvider const checked = Checked(TEST_PROVIDERS, GetParam().provider);
    EXPECT_EQ(checked.broken.empty() ? 0 : 1, checked.exitCode);
    EXPECT_EQ(GetParam().broken, Steady(GetParam(), checked.broken)) << checked.tap;
}

INSTANTIATE_TEST_SUITE_P(Each, LoadedProvidersTest, testing::ValuesIn(Loaded()), NameOf);

TEST(BrokenProvidersListTest, EveryBrokenProviderIsKnownHere) {
    std::set<std::string> known;
    for (Expected const& expected : Broken()) {
        known.insert(expected.provider);
    }
    EXPECT_EQ(NamesIn(BROKEN_PROVIDERS), known);
}

TEST(BrokenProvidersListTest, EveryProviderOfTheLibrarysTestsIsKnownHere) {
    std::set<std::string> known = {"", "example", "example-cam", "winbind", "winbind-cam"};
    for (Expected const& expected : Loaded()) {
        known.insert(expected.provider);
    }
    std::set<std::string> there = NamesIn(TEST_PROVIDERS); // "" is lib.so, of the empty name
    there.insert({"example", "example-cam", "winbind", "winbind-cam"});
    EXPECT_EQ(there, known);
}

TEST(ProviderCheckTest, AFileThatIsNotThereIsAFinding) {
    CheckedProvider const checked = Checked("/nonexistent", "nothing");
    EXPECT_EQ(1, checked.exitCode);
    EXPECT_EQ(Rules{"loads"}, checked.broken);
}

TEST(ProviderCheckTest, WithoutAProfileNothingThatChangesTheHostIsCalled) {
    CheckedProvider const checked = Checked(BROKEN_PROVIDERS, "logs-secret", "");
    EXPECT_EQ(0, checked.exitCode);
    EXPECT_EQ(1U, checked.skipped.count("changes"));
    EXPECT_EQ(1U, checked.skipped.count("secrets"));
}

TEST(ProviderCheckTest, ACodeThatTheProfileNamesIsNoFinding) {
    CheckedProvider const checked =
        Checked(BROKEN_PROVIDERS, "odd-code", std::string(profile) + "codes = \"17 0x1092\"\n");
    EXPECT_EQ(0, checked.exitCode) << checked.tap;
}

TEST(ProviderCheckTest, TheExampleInRustKeepsToTheRules) {
    std::string const provider = RUST_PROVIDER;
    if (provider.empty()) {
        GTEST_SKIP() << "there is no rustc, or not for this kind of build";
    }
    CheckedProvider const checked(PROVIDER_CHECK, provider, profile);
    EXPECT_EQ(0, checked.exitCode) << checked.tap;
    Rules const notOfSanitized = {"released-once", "released-own", "released-all", "overrun"};
    EXPECT_EQ((Rules{"secrets", "joins"}),
              SANITIZED != 0 ? Without(notOfSanitized, checked.skipped) : checked.skipped)
        << checked.tap;
}
