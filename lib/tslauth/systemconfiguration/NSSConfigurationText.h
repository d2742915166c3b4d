// SPDX-License-Identifier: Apache-2.0
#ifndef TSLAUTH_SYSTEMCONFIGURATION_NSSCONFIGURATIONTEXT_H
#define TSLAUTH_SYSTEMCONFIGURATION_NSSCONFIGURATIONTEXT_H

#include <tslauth/systemconfiguration/NSSConfiguration.h>

#include <deque>
#include <string>
#include <string_view>

/// The name-service switch file as text in memory, without a stream between, for the same reason as
/// for PAM policies.
namespace SystemConfiguration {

/// As `operator>>`, with the same result and the same exceptions.
void ReadConfiguration(std::string_view text, NSSConfiguration& configuration);

/// Reads line by line. Both readers are a loop over this.
class NSSLineReader {
public:
    /// @param configuration must outlive the reader, and no queue of it may be removed meanwhile
    explicit NSSLineReader(NSSConfiguration& configuration) : _configuration(configuration) {}

    /// @param line without its line feed
    void Read(std::string_view line);

private:
    std::deque<NSSService>& ServicesOf(NSSDatabase::Database database);

    NSSConfiguration& _configuration;
    /// Made when the first service of the database has been understood, and looked up once.
    std::deque<NSSService>* _services[NSSDatabase::aliases + 1] = {};
};

/// Each appends to `out` what `operator<<` writes. Where one throws, `out` holds what came before.
void PrintService(NSSService const& service, std::string& out);
void PrintConfiguration(NSSConfiguration const& configuration, std::string& out);

} // namespace SystemConfiguration

#endif
