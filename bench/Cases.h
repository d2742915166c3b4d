// SPDX-License-Identifier: Apache-2.0
#ifndef BENCH_CASES_H
#define BENCH_CASES_H

#include "Table.h"

#include <string>
#include <utility>
#include <vector>

namespace bench {

/// The file systems to write on, each a name for the table and a folder.
using Places = std::vector<std::pair<std::string, std::string>>;

/// One function a file: adds the cases of its hot path.
void AddPAMPolicyCases(Table& table, Places const& places);
void AddNSSConfigurationCases(Table& table, Places const& places);
void AddConfigurationCases(Table& table, Places const& places);
void AddActiveDirectoryProviderCases(Table& table);
void AddActiveDirectoryStoreCases(Table& table, Places const& places);
void AddActiveDirectoryStoreQuestionsCases(Table& table);
void AddCertificateThumbprintCases(Table& table);
void AddHistoryCases(Table& table);
void AddTslauthctlCases(Table& table);

} // namespace bench

#endif
