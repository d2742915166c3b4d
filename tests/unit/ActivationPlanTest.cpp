// SPDX-License-Identifier: Apache-2.0
#include <tslauth/ActivationPlan.h>

#include <tslauth/Exceptions.h>
#include <tslauth/Paths.h>
#include <tslauth/systemconfiguration/NSSDatabase.h>

#include <gmock/gmock.h>

#include <map>
#include <stdexcept>

namespace tessel::authentication {
namespace {

using testing::Contains;
using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using testing::SizeIs;

constexpr char local[] = "passwd: files\ngroup: files\nshadow: files\n";
constexpr char record[] = "remote-authentication-store = \"None\"\n";
ProviderEntries const provider = MakeProviderEntries("pam_prov.so", {"a"}, "prov", {});

/// Files by their paths; any other cannot be opened.
struct Files {
    std::map<std::string, std::string> texts;

    std::string operator()(std::string const& path) const {
        auto const found = texts.find(path);
        if (found == texts.end()) {
            throw IOError("Cannot open '" + path + "'");
        }
        return found->second;
    }
};

Files const usual = {{{Paths::PAMPolicy, "auth required u.so\naccount required u.so\n"},
                      {Paths::NSSConfiguration, local},
                      {Paths::AuthenticationConfiguration, record}}};

std::vector<std::string> PathsOf(ActivationPreview const& preview) {
    std::vector<std::string> paths;
    for (auto const& file : preview.files) {
        paths.push_back(file.path);
    }
    return paths;
}

template <typename Class> bool IsRefusedBy(ActivationPreview const& preview) {
    try {
        if (preview.refusal) {
            std::rethrow_exception(preview.refusal);
        }
    } catch (Class const&) {
        return true;
    }
    return false;
}

/// What a plan costs a name-service switch.
std::vector<std::string> SwitchLosses(ActivationPlan const& plan, std::string const& text) {
    return plan.PreviewOf(Paths::NSSConfiguration, Files{{{Paths::NSSConfiguration, text}}}).losses;
}

std::vector<std::string> NSSInsertLosses(std::string const& text,
                                         std::list<std::string> const& parameters = {}) {
    auto const entries = MakeProviderEntries("pam_prov.so", {}, "prov", parameters);
    return SwitchLosses(ActivationPlan::Activating(entries, {}), text);
}

std::vector<std::string> NSSRemoveLosses(std::string const& text) {
    return SwitchLosses(ActivationPlan::Withdrawing(provider), text);
}

std::vector<std::string> PolicyLosses(ActivationPlan const& plan, std::string const& text,
                                      std::string const& included = {}) {
    Files files{{{Paths::PAMPolicy, text}}};
    if (!included.empty()) {
        files.texts["/usr/lib/pam.d/included"] = included;
    }
    return plan.PreviewOf(Paths::PAMPolicy, files).losses;
}

/// Of `text` and an "account" that is no matter.
std::vector<std::string> PAMInsertLosses(std::string const& text) {
    return PolicyLosses(ActivationPlan::Activating(provider, {}),
                        "auth required first.so\naccount required a.so\n" + text);
}

TEST(ActivationPlanTest, AnActivationEditsThePolicyTheSwitchAndTheRecordInThisOrder) {
    auto const preview = ActivationPlan::Activating(provider, "Active Directory").Preview(usual);
    EXPECT_FALSE(preview.refusal);
    EXPECT_THAT(PathsOf(preview), ElementsAre(Paths::PAMPolicy, Paths::NSSConfiguration,
                                              Paths::AuthenticationConfiguration));
    EXPECT_TRUE(preview.Changes());
    EXPECT_FALSE(preview.Loses());
    EXPECT_EQ("passwd: prov files\ngroup: prov files\nshadow: prov files\n",
              preview.files[1].after);
    EXPECT_EQ("remote-authentication-store = \"Active Directory\"\n", preview.files[2].after);
}

/// A host as Debian installs it, which no model can read.
Files const stock = {
    {{Paths::PAMPolicy,
      "# who may log in\n@include common-auth\nauth required "
      "/lib/security/$ISA/pam_access.so \\\n  nodefgroup\n-session optional s.so\n"},
     {Paths::NSSConfiguration, "passwd:         files systemd\ngroup:          files systemd\n"
                               "shadow:         files systemd\ngshadow:        files systemd\n\n"
                               "hosts:          files mdns4_minimal [NOTFOUND=return] dns"},
     {Paths::AuthenticationConfiguration, record}}};

TEST(ActivationPlanTest, TheLosslessFormChangesOnlyTheLinesConcernedAndLosesNothing) {
    auto const plan = ActivationPlan::Activating(provider, "Active Directory", EditForm::Lossless);
    auto const preview = plan.Preview(stock);
    EXPECT_FALSE(preview.refusal);
    EXPECT_FALSE(preview.Loses());
    ASSERT_EQ(preview.files.size(), 3U);
    EXPECT_EQ(preview.files[0].after,
              "# who may log in\naccount\tsufficient\t/lib/security/$ISA/pam_prov.so\ta \n"
              "@include common-auth\nauth required /lib/security/$ISA/pam_access.so \\\n"
              "  nodefgroup\nauth\tsufficient\t/lib/security/$ISA/pam_prov.so\ta \n"
              "-session optional s.so\n");
    EXPECT_EQ(preview.files[1].after,
              "passwd:         prov files systemd\ngroup:          prov files systemd\n"
              "shadow:         prov files systemd\ngshadow:        files systemd\n\n"
              "hosts:          files mdns4_minimal [NOTFOUND=return] dns");
    EXPECT_THAT(preview.files[0].notes, IsEmpty());

    Files active = stock;
    for (auto const& file : preview.files) {
        active.texts[file.path] = file.after;
    }
    auto const back = ActivationPlan::Withdrawing(provider, EditForm::Lossless).Preview(active);
    EXPECT_FALSE(back.Loses());
    for (auto const& file : back.files) {
        EXPECT_EQ(file.after, stock(file.path));
    }
    EXPECT_TRUE(ActivationPlan::Activating(provider, "Active Directory").Preview(stock).refusal);
}

TEST(ActivationPlanTest, TheLosslessFormTakesOutEveryCopyAndThatIsNoLoss) {
    std::string const entry = "auth sufficient /lib/security/$ISA/pam_prov.so a\n";
    Files const files = {{{Paths::PAMPolicy, entry + "auth required u.so\n" + entry},
                          {Paths::NSSConfiguration, "passwd: prov files prov\ngroup: files\n"}}};
    auto const preview = ActivationPlan::Withdrawing(provider, EditForm::Lossless).Preview(files);
    EXPECT_FALSE(preview.Loses());
    EXPECT_EQ(preview.files[0].after, "auth required u.so\n");
    EXPECT_EQ(preview.files[1].after, "passwd: files\ngroup: files\n");
}

TEST(ActivationPlanTest, TheLosslessFormNamesAJumpThatWouldLandElsewhere) {
    Files files = usual;
    files.texts[Paths::PAMPolicy] =
        "auth [success=2 default=ignore] u.so\nauth required /lib/security/$ISA/pam_access.so\n"
        "auth required a.so\nauth required b.so\naccount required a.so\n";
    auto const preview =
        ActivationPlan::Activating(provider, "Active Directory", EditForm::Lossless).Preview(files);
    EXPECT_THAT(preview.files[0].losses, ElementsAre(HasSubstr("would land elsewhere")));
}

TEST(ActivationPlanTest, TheLosslessFormRefusesWhatItsReadersUnderstandDifferently) {
    Files files = usual;
    files.texts[Paths::NSSConfiguration] += "passwd: files\n";
    EXPECT_TRUE(IsRefusedBy<ConfigurationError>(
        ActivationPlan::Activating(provider, "Active Directory", EditForm::Lossless)
            .Preview(files)));
}

TEST(ActivationPlanTest, AWithdrawalEditsThePolicyAndThenTheSwitchAndNoRecord) {
    Files active = usual;
    for (auto const& file :
         ActivationPlan::Activating(provider, "Active Directory").Preview(usual).files) {
        active.texts[file.path] = file.after;
    }
    active.texts.erase(Paths::AuthenticationConfiguration);
    auto const preview = ActivationPlan::Withdrawing(provider).Preview(active);
    EXPECT_FALSE(preview.refusal);
    EXPECT_THAT(PathsOf(preview), ElementsAre(Paths::PAMPolicy, Paths::NSSConfiguration));
    EXPECT_EQ(local, preview.files[1].after);
}

TEST(ActivationPlanTest, AnUnknownStoreIsReplacedInTheRecordAndThenRefused) {
    auto const preview = ActivationPlan::Replacing("Example Store", "None").Preview(usual);
    EXPECT_THAT(PathsOf(preview), ElementsAre(Paths::AuthenticationConfiguration));
    EXPECT_TRUE(IsRefusedBy<UnknownRemoteAuthenticationStoreException>(preview));
}

TEST(ActivationPlanTest, ARecordThatCannotBeReadRefusesBeforeAnyFile) {
    Files files = usual;
    files.texts.erase(Paths::AuthenticationConfiguration);
    auto preview = ActivationPlan::Activating(provider, "Active Directory").Preview(files);
    EXPECT_THAT(preview.files, IsEmpty());
    EXPECT_TRUE(IsRefusedBy<IOError>(preview));
    files.texts[Paths::AuthenticationConfiguration] = "no delimiter\n";
    preview = ActivationPlan::Activating(provider, "Active Directory").Preview(files);
    EXPECT_THAT(preview.files, IsEmpty());
    EXPECT_TRUE(IsRefusedBy<ConfigurationError>(preview));
}

TEST(ActivationPlanTest, ARecordWithoutItsKeyRefusesAfterTheSystemFiles) {
    Files files = usual;
    files.texts[Paths::AuthenticationConfiguration] = "other = \"1\"\n";
    auto const preview = ActivationPlan::Activating(provider, "Active Directory").Preview(files);
    EXPECT_THAT(PathsOf(preview), ElementsAre(Paths::PAMPolicy, Paths::NSSConfiguration));
    EXPECT_TRUE(IsRefusedBy<InvalidKeyException>(preview));
}

TEST(ActivationPlanTest, AFileThatTheLibraryCannotReadRefusesAfterThoseBeforeIt) {
    Files files = usual;
    files.texts[Paths::NSSConfiguration] = "gshadow: files\n";
    auto const preview = ActivationPlan::Activating(provider, "Active Directory").Preview(files);
    EXPECT_THAT(PathsOf(preview), ElementsAre(Paths::PAMPolicy));
    EXPECT_TRUE(IsRefusedBy<SystemConfiguration::InvalidDatabaseException>(preview));
}

TEST(ActivationPlanTest, AnEmptyPlanDoesNothing) {
    auto const preview = ActivationPlan().Preview(Files{});
    EXPECT_THAT(preview.files, IsEmpty());
    EXPECT_FALSE(preview.refusal);
    ActivationPlan().Execute();
}

TEST(ActivationPlanTest, AFileThatThePlanDoesNotWriteHasNoPreview) {
    EXPECT_THROW(
        ActivationPlan::Withdrawing(provider).PreviewOf(Paths::AuthenticationConfiguration, usual),
        std::invalid_argument);
}

TEST(ActivationPlanTest, TheEditedPlacesAreNamedInTheOrderOfTheEdit) {
    EXPECT_THAT(EditedFacilities(), ElementsAre("auth", "account"));
    EXPECT_THAT(EditedDatabases(), ElementsAre("passwd", "group", "shadow"));
}

TEST(ActivationPlanTest, AValueOfTheRecordThatWouldNotBeReadBackIsALoss) {
    Files files = usual;
    files.texts[Paths::AuthenticationConfiguration] = std::string(record) + "=x\n";
    auto const preview = ActivationPlan::Activating(provider, "Active Directory").Preview(files);
    ASSERT_EQ(3U, preview.files.size());
    EXPECT_THAT(preview.files[2].losses, ElementsAre("the value of the key '' would be lost"));
}

TEST(ActivationPlanTest, TheIntendedEditIsNone) {
    constexpr char active[] = "passwd: prov files\ngroup: prov files\nshadow: prov files\n";
    EXPECT_THAT(NSSInsertLosses(local), IsEmpty());
    EXPECT_THAT(NSSInsertLosses(active), IsEmpty());
    EXPECT_THAT(NSSRemoveLosses(active), IsEmpty());
    EXPECT_THAT(NSSRemoveLosses(local), IsEmpty());
    EXPECT_THAT(PAMInsertLosses("auth required a.so\nsession required b.so x\n"), IsEmpty());
}

TEST(ActivationPlanTest, AServiceBehindABracketIsNamed) {
    EXPECT_THAT(NSSInsertLosses(local + std::string("hosts: files [NOTFOUND=return] dns\n")),
                ElementsAre("hosts: service 'dns' would be lost"));
}

TEST(ActivationPlanTest, AServiceBeforeALaterBracketLosesItsNeighbours) {
    EXPECT_THAT(
        NSSInsertLosses(local + std::string("hosts: files mdns4_minimal [NOTFOUND=return] dns\n")),
        ElementsAre("hosts: service 'mdns4_minimal [NOTFOUND=return]' would be lost",
                    "hosts: service 'dns' would be lost"));
}

TEST(ActivationPlanTest, AServiceReadFromTheMiddleOfAWordIsNamed) {
    auto const losses =
        NSSInsertLosses(local + std::string("rpc: a [NOTFOUND=return] longservicename\n"));
    EXPECT_THAT(losses, ElementsAre(AnyOf(HasSubstr("'longservicename' would be lost"),
                                          HasSubstr("would be lost")),
                                    HasSubstr("would be added")));
}

TEST(ActivationPlanTest, AMissingShadowLineHadADefault) {
    EXPECT_THAT(
        NSSInsertLosses("passwd: files\ngroup: files\n"),
        ElementsAre("shadow: the default 'files', which holds without a line, would be lost"));
}

TEST(ActivationPlanTest, MergedLinesAreNamed) {
    EXPECT_THAT(NSSInsertLosses(local + std::string("hosts: dns\nhosts: files\n")),
                ElementsAre("hosts: service 'dns' would be added"));
}

TEST(ActivationPlanTest, AProvidersParametersCostItsNeighboursOnTheWayBack) {
    EXPECT_THAT(
        NSSInsertLosses(local, {"NOTFOUND=continue"}),
        ElementsAre("group: service 'files' would be lost (when the store is left again)",
                    "passwd: service 'files' would be lost (when the store is left again)",
                    "shadow: service 'files' would be lost (when the store is left again)"));
}

TEST(ActivationPlanTest, ParametersOfTheServiceAreALossAlsoWhereNoByteGoes) {
    for (char const* const parameter : {"NOTFOUND=return", "NOTFOUND=continue"}) {
        auto const entries = MakeProviderEntries("pam_prov.so", {}, "prov", {parameter});
        auto const plan = ActivationPlan::Activating(entries, {}, EditForm::Lossless);
        EXPECT_THAT(SwitchLosses(plan, local), SizeIs(1)) << parameter;
        EXPECT_THAT(SwitchLosses(ActivationPlan::Withdrawing(entries, EditForm::Lossless), local),
                    IsEmpty());
    }
}

TEST(ActivationPlanTest, ParametersThatTheCLibraryDoesNotUnderstandCostTheNeighboursAtOnce) {
    EXPECT_THAT(NSSInsertLosses(local, {"x", "y"}),
                Contains("passwd: service 'files' would be lost"));
}

TEST(ActivationPlanTest, ABracketInAnEditedDatabaseCostsTheServicesBeforeItOnTheWayBack) {
    EXPECT_THAT(NSSInsertLosses("passwd: files [NOTFOUND=return]\ngroup: files\nshadow: files\n"),
                ElementsAre("passwd: service 'files [NOTFOUND=return]' would be lost (when the "
                            "store is left again)"));
}

TEST(ActivationPlanTest, CommentsAreNoLoss) {
    EXPECT_THAT(NSSInsertLosses("# c\n" + std::string(local)), IsEmpty());
    EXPECT_THAT(PAMInsertLosses("# c\nauth required a.so # d\n"), IsEmpty());
}

TEST(ActivationPlanTest, AJumpOverTheInsertedEntryLandsElsewhere) {
    EXPECT_THAT(PAMInsertLosses("auth [success=1 default=ignore] u.so\n"
                                "auth required /lib/security/$ISA/pam_access.so\n"
                                "auth required b.so\nauth required c.so\n"),
                IsEmpty())
        << "going on at the inserted entry is going on at what follows it";
    EXPECT_THAT(PAMInsertLosses("auth [success=2 default=ignore] u.so\n"
                                "auth required /lib/security/$ISA/pam_access.so\n"
                                "auth required b.so\nauth required c.so\n"),
                ElementsAre("auth: the jump 'success=2' of '[success=2 default=ignore] u.so' would "
                            "land elsewhere"));
    EXPECT_THAT(PAMInsertLosses("auth [success=1 default=ignore] u.so\nauth required b.so\n"
                                "auth required c.so\n"),
                IsEmpty())
        << "the entry is inserted before the jump";
}

TEST(ActivationPlanTest, AJumpOverTheRemovedEntryLandsElsewhere) {
    auto const plan = ActivationPlan::Withdrawing(provider);
    EXPECT_THAT(PolicyLosses(plan, "auth [success=2 default=ignore] u.so\n"
                                   "auth sufficient /lib/security/$ISA/pam_prov.so a\n"
                                   "auth required b.so\nauth required c.so\n"),
                ElementsAre(HasSubstr("the jump 'success=2'")));
    EXPECT_THAT(PolicyLosses(plan, "auth [success=1 default=ignore] u.so\nauth required b.so\n"
                                   "auth sufficient /lib/security/$ISA/pam_prov.so a\n"
                                   "auth required c.so\n"),
                IsEmpty());
}

TEST(ActivationPlanTest, AnArgumentWithARunOfBlanksIsAltered) {
    EXPECT_THAT(
        PAMInsertLosses("auth required a.so [x  y]\n"),
        ElementsAre("auth: entry 'required a.so [x  y]' would become 'required a.so [x y]'"));
}

TEST(ActivationPlanTest, AnEntryThatEndsTooEarlyTakesFromTheNext) {
    EXPECT_THAT(PAMInsertLosses("session required\nsession required b.so\n"),
                ElementsAre(HasSubstr("would be lost"), HasSubstr("would be lost"),
                            HasSubstr("would be added")));
}

TEST(ActivationPlanTest, ACarriageReturnIsPartOfTheLastWordToLibpam) {
    EXPECT_THAT(PAMInsertLosses("session required b.so\r\n"), Not(IsEmpty()));
}

TEST(ActivationPlanTest, AFacilityWithoutEntriesWasDecidedByAnotherPolicy) {
    auto const plan = ActivationPlan::Activating(provider, {});
    constexpr char text[] = "auth required u.so\naccount include included\n";
    EXPECT_THAT(PolicyLosses(plan, text, "# nothing\n"),
                ElementsAre(HasSubstr("account: the policy 'other'")));
    EXPECT_THAT(PolicyLosses(plan, text), IsEmpty());
}

} // namespace
} // namespace tessel::authentication
