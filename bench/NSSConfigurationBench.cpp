// SPDX-License-Identifier: Apache-2.0
#include "Augeas.h"
#include "Edit.h"
#include "Floor.h"
#include "ProviderModules.h"
#include "StreamCode.h"

namespace bench {

namespace {

using namespace tessel::authentication;

constexpr char Name[] = "/etc/nsswitch.conf";

/// The databases again and again, which the library joins to a line each.
std::string Configuration(int lines) {
    static constexpr char const* services[] = {" files ldap\n", " files\n", " files nis dns\n",
                                               " db files\n"};
    std::string text;
    for (int i = 0; i < lines; ++i) {
        text += Floor::Databases[static_cast<std::size_t>(i) % Floor::Databases.size()];
        text += ':';
        text += services[i % 4];
    }
    return text;
}

} // namespace

void AddNSSConfigurationCases(Table& table, Places const& places) {
    SystemFile file;
    file.title = "nsswitch.conf";
    file.text = Configuration;
    file.ours = [service = ProviderModules::NSSServiceFor("bench", {})](std::string const& source,
                                                                        std::string const& target) {
        ReplaceFile(target, ProviderModules::EditedNSSConfiguration(
                                ReadFile(source), ProviderModules::Edit::insert, service));
    };
    file.floor = [](std::string const& source, std::string const& target) {
        Floor::EditNSSConfiguration(source.c_str(), target, "bench");
    };
    file.streams = [](std::string const& source, std::string const& target) {
        StreamCode::EditNSSConfiguration(source, target, "bench");
    };
    file.name = Name;
    file.augeas = [](std::string const& root) {
        Augeas augeas(root, "Nsswitch.lns", Name);
        for (std::string const database : {"passwd", "group", "shadow"}) {
            std::string const first = "/database[.='" + database + "'][1]/service[1]";
            augeas.Insert(first, "service", true);
            augeas.Set(first, "bench");
        }
        augeas.Save();
    };
    AddEditCases(table, places, file);
}

} // namespace bench
