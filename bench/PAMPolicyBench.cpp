// SPDX-License-Identifier: Apache-2.0
#include "Augeas.h"
#include "Edit.h"
#include "Floor.h"
#include "ProviderModules.h"
#include "StreamCode.h"

namespace bench {

namespace {

using namespace tessel::authentication;

constexpr char Name[] = "/etc/pam.d/system-auth-generic";

/// A policy as the library prints it, with `lines` entries.
std::string Policy(int lines) {
    static constexpr char const* tails[] = {
        "required\t/lib/security/$ISA/pam_env.so\t",
        "sufficient\t/lib/security/$ISA/pam_unix.so\tnullok try_first_pass ",
        "[success=1 default=ignore]\t/lib/security/$ISA/pam_succeed_if.so\tuid >= 1000 quiet ",
        "requisite\t/lib/security/$ISA/pam_tally.so\tdeny=5 ",
    };
    std::string text = "#%PAM-1.0\n\n";
    for (char const* const facility : {"account", "auth", "password", "session"}) {
        text += facility;
        text += "\trequired\t/lib/security/$ISA/pam_access.so\t\n";
        for (int i = 1; i < lines / 4; ++i) {
            text += facility;
            text += '\t';
            text += tails[i % 4];
            text += '\n';
        }
        text += '\n';
    }
    return text;
}

} // namespace

void AddPAMPolicyCases(Table& table, Places const& places) {
    static constexpr std::string_view tail =
        "\tsufficient\t/lib/security/$ISA/pam_bench.so\tuse_first_pass debug \n";
    static std::string const account = "account" + std::string(tail);
    static std::string const auth = "auth" + std::string(tail);
    SystemFile file;
    file.title = "PAM policy";
    file.text = Policy;
    file.ours = [entry = ProviderModules::PAMEntryFor("pam_bench.so", {"use_first_pass", "debug"})](
                    std::string const& source, std::string const& target) {
        ReplaceFile(target, ProviderModules::EditedPAMPolicy(ReadFile(source),
                                                             ProviderModules::Edit::insert, entry));
    };
    file.floor = [](std::string const& source, std::string const& target) {
        Floor::EditPAMPolicy(source.c_str(), target, account, auth);
    };
    file.streams = [](std::string const& source, std::string const& target) {
        StreamCode::EditPAMPolicy(
            source, target,
            {"sufficient", "/lib/security/$ISA/pam_bench.so", {"use_first_pass", "debug"}});
    };
    file.name = Name;
    file.augeas = [](std::string const& root) {
        Augeas augeas(root, "Pam.lns", Name);
        int number = 0;
        for (std::string const facility : {"account", "auth"}) {
            std::string const label = "0" + std::to_string(++number);
            std::string const at = "/" + label;
            augeas.Insert("/*[type='" + facility + "'][module='/lib/security/$ISA/pam_access.so']",
                          label, false);
            augeas.Set(at + "/type", facility);
            augeas.Set(at + "/control", "sufficient");
            augeas.Set(at + "/module", "/lib/security/$ISA/pam_bench.so");
            augeas.Set(at + "/argument[1]", "use_first_pass");
            augeas.Set(at + "/argument[2]", "debug");
        }
        augeas.Save();
    };
    AddEditCases(table, places, file);
}

} // namespace bench
