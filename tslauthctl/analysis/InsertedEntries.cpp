// SPDX-License-Identifier: Apache-2.0
#include "analysis/InsertedEntries.h"

#include "analysis/HostFile.h"
#include "terminal/Console.h"

#include <tslauth/Paths.h>

#include <base/AsciiText.h>
#include <base/FileError.h>
#include <base/WholeFile.h>

#include <algorithm>
#include <filesystem>
#include <list>
#include <system_error>

namespace tessel::tslauthctl {

using namespace authentication;

namespace {

std::list<std::string> Words(std::string_view text) {
    std::list<std::string> words;
    for (auto word = base::AsciiText::TakeWord(text); !word.empty();
         word = base::AsciiText::TakeWord(text)) {
        words.emplace_back(word);
    }
    return words;
}

std::string Joined(std::list<std::string> const& words) {
    std::string text;
    for (auto const& word : words) {
        text += (text.empty() ? "" : " ") + word;
    }
    return text;
}

std::vector<std::string> Fields(std::string_view line) {
    std::vector<std::string> fields(1);
    for (char const c : line) {
        if (c == '\t') {
            fields.emplace_back();
        } else {
            fields.back() += c;
        }
    }
    return fields;
}

/// The module's name without the folder that every entry's begins with.
std::string ModuleName(std::string const& module) {
    std::string const prefix = Paths::PAMModulePrefix;
    return base::AsciiText::StartsWith(module, prefix) ? module.substr(prefix.size()) : module;
}

} // namespace

bool IsSame(ProviderEntries const& left, ProviderEntries const& right) {
    return left.pam == right.pam && left.nss == right.nss;
}

EntriesList Without(EntriesList entries, ProviderEntries const& other) {
    auto const same = [&](ProviderEntries const& each) { return IsSame(each, other); };
    entries.erase(std::remove_if(entries.begin(), entries.end(), same), entries.end());
    return entries;
}

EntriesList ReadInserted(std::string_view text) {
    EntriesList entries;
    for (auto const line : base::AsciiText::Lines(text)) {
        auto const fields = Fields(line.substr(0, line.find('\n')));
        if (fields.size() == 4 && !fields[0].empty() && !fields[2].empty()) {
            entries.push_back(
                MakeProviderEntries(fields[0], Words(fields[1]), fields[2], Words(fields[3])));
        }
    }
    return entries;
}

std::string PrintInserted(EntriesList const& entries) {
    std::string text;
    for (auto const& each : entries) {
        text += ModuleName(each.pam.module()) + "\t" + Joined(each.pam.parameters()) + "\t" +
                each.nss.module() + "\t" + Joined(each.nss.parameters()) + "\n";
    }
    return text;
}

EntriesList InsertedOnHost() {
    return ReadInserted(HostFileOrNothing(InsertedRecord).value_or(""));
}

void RecordInserted(EntriesList const& entries) {
    auto const text = PrintInserted(entries);
    auto const before = HostFileOrNothing(InsertedRecord);
    if (before.value_or("") == text) {
        return;
    }
    std::filesystem::path const record(InsertedRecord);
    try {
        if (text.empty()) {
            // A host without such entries is as it was before the first.
            std::filesystem::remove(record);
            std::error_code inUse; // the folder has other records, too
            std::filesystem::remove(record.parent_path(), inUse);
            base::SyncFolderOf(InsertedRecord);
            return;
        }
        std::filesystem::create_directories(record.parent_path());
        base::ReplaceFile(InsertedRecord, text);
    } catch (std::exception const& e) {
        throw Failure(ExitCode::failure,
                      std::string("Whose entries stand in the files cannot be recorded: ") +
                          e.what());
    }
}

} // namespace tessel::tslauthctl
