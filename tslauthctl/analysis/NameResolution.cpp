// SPDX-License-Identifier: Apache-2.0
#include "analysis/NameResolution.h"

#include "analysis/HostFile.h"
#include "terminal/Console.h"

#include <strandctl/HostCtlException.h>
#include <strandctl/NetworkInfoImpl.h>

#include <base/AsciiText.h>
#include <base/FileError.h>
#include <base/WholeFile.h>

#include <algorithm>
#include <climits>
#include <unistd.h>

namespace tessel::tslauthctl {

using namespace base::AsciiText;

namespace {

constexpr char Hosts[] = "/etc/hosts";
constexpr char ResolvConf[] = "/etc/resolv.conf";

std::string HostName() {
    char name[HOST_NAME_MAX + 1] = {};
    return gethostname(name, sizeof name - 1) == 0 ? name : "";
}

bool IsOfHost(std::string_view name, std::string_view shortName) {
    return EqualsIgnoringCase(name.substr(0, name.find('.')), shortName);
}

} // namespace

std::vector<std::string> OtherNames(std::string_view hosts, std::string const& address,
                                    std::string const& hostName) {
    auto const shortName = hostName.substr(0, hostName.find('.'));
    std::vector<std::string> names;
    for (auto line : Lines(hosts)) {
        line = line.substr(0, line.find('#'));
        if (TakeWord(line) != address) {
            continue;
        }
        for (auto name = TakeWord(line); !name.empty(); name = TakeWord(line)) {
            bool const known = std::find(names.begin(), names.end(), name) != names.end();
            if (!known && !IsOfHost(name, shortName)) {
                names.emplace_back(name);
            }
        }
    }
    return names;
}

NameResolution::NameResolution() {
    for (auto const* const path : {Hosts, ResolvConf}) {
        _files.push_back({path, HostFileOrNothing(path)});
    }
}

std::vector<std::string> NameResolution::NamesToBeDropped() const {
    try {
        StrandCtl::Network::NetworkInfoImpl const network;
        auto const address =
            network.GetManagementInterface().GetIpConfig().GetIpv4Address().ToString();
        return OtherNames(_files.front().text.value_or(""), address, HostName());
    } catch (HostCtl::Lib::HostCtlException const&) {
        return {}; // the join tells why there is no such address
    }
}

std::vector<std::string> NameResolution::PutBack() const {
    std::vector<std::string> restored;
    for (auto const& file : _files) {
        if (HostFileOrNothing(file.path) == file.text) {
            continue;
        }
        try {
            if (file.text) {
                base::ReplaceFile(file.path, *file.text);
            } else if (unlink(file.path.c_str()) != 0) {
                throw base::FileError("remove", file.path, errno);
            }
        } catch (base::FileError const& e) {
            throw Failure(ExitCode::failure,
                          std::string("What the join changed is not put back: ") + e.what());
        }
        restored.push_back(file.path);
    }
    return restored;
}

} // namespace tessel::tslauthctl
