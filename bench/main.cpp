// SPDX-License-Identifier: Apache-2.0
// Run by tools/bench, in a node: some cases need the fixed paths.
#include "Cases.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <exception>
#include <sys/statfs.h>
#include <vector>

int main(int count, char** values) {
    using namespace bench;
    std::vector<char*> arguments(values, values + count);
    bool observe = false;
    if (arguments.size() > 1 && std::strcmp(arguments[1], "--observe") == 0) {
        observe = true;
        arguments.erase(arguments.begin() + 1);
    }
    int left = static_cast<int>(arguments.size());
    arguments.push_back(nullptr);
    benchmark::Initialize(&left, arguments.data());
    char const* const tmpfs = std::getenv("BENCH_TMPFS");
    char const* const disk = std::getenv("BENCH_DISK");
    if (tmpfs == nullptr || disk == nullptr || left != 1) {
        std::fputs("tslauth_bench: to be run by tools/bench\n", stderr);
        return 2;
    }

    Places const places = {{"tmpfs", tmpfs}, {"disk", disk}};
    Table table;
    AddPAMPolicyCases(table, places);
    AddNSSConfigurationCases(table, places);
    AddConfigurationCases(table, places);
    AddActiveDirectoryProviderCases(table);
    AddActiveDirectoryStoreCases(table, places);
    AddActiveDirectoryStoreQuestionsCases(table);
    AddCertificateThumbprintCases(table);
    AddHistoryCases(table);
    AddTslauthctlCases(table);
    if (observe) {
        table.Observe();
        return 0;
    }
    return table.Run(values[0]) ? 0 : 1;
}
