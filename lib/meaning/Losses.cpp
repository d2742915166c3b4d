// SPDX-License-Identifier: Apache-2.0
#include "Losses.h"

#include <algorithm>
#include <set>

namespace tessel::meaning {

namespace {

/// One service or entry: what it says, and what it is known by when it says something else.
struct Item {
    std::string text;
    std::string key;
};

using Items = std::vector<Item>;

/// Those of `left` that are not in `right`, each as often as it is missing there.
Items Missing(Items const& left, Items const& right) {
    std::multiset<std::string> there;
    for (auto const& item : right) {
        there.insert(item.text);
    }
    Items missing;
    for (auto const& item : left) {
        if (auto const found = there.find(item.text); found != there.end()) {
            there.erase(found);
        } else {
            missing.push_back(item);
        }
    }
    return missing;
}

bool SameTexts(Items const& left, Items const& right) {
    return std::equal(left.begin(), left.end(), right.begin(), right.end(),
                      [](Item const& a, Item const& b) { return a.text == b.text; });
}

/// @param where the database or facility
/// @param kind "service" or "entry"
void Compare(std::string const& where, std::string const& kind, std::string const& kinds,
             Items const& before, Items const& after, std::vector<std::string>& losses) {
    if (SameTexts(before, after)) {
        return;
    }
    std::string const subject = where + ": " + kind + " '";
    auto added = Missing(after, before);
    auto const lost = Missing(before, after);
    for (auto const& item : lost) {
        auto const altered = std::find_if(added.begin(), added.end(),
                                          [&](Item const& other) { return other.key == item.key; });
        std::string loss = subject;
        loss += item.text;
        if (altered != added.end()) {
            loss += "' would become '";
            loss += altered->text;
            loss += "'";
            added.erase(altered);
        } else {
            loss += "' would be lost";
        }
        losses.push_back(std::move(loss));
    }
    for (auto const& item : added) {
        std::string addition = subject;
        addition += item.text;
        addition += "' would be added";
        losses.push_back(std::move(addition));
    }
    if (lost.empty() && added.empty()) {
        losses.push_back(where + ": the order of the " + kinds + " would change");
    }
}

/// Takes `inserted` out of `services` where it stands first from `place` on.
bool Without(NSSServices const& services, NSSServices const& inserted, std::size_t place,
             NSSServices& rest) {
    if (inserted.size() + place > services.size() ||
        !std::equal(inserted.begin(), inserted.end(),
                    services.begin() + static_cast<std::ptrdiff_t>(place))) {
        return false;
    }
    rest = services;
    auto const start = rest.begin() + static_cast<std::ptrdiff_t>(place);
    rest.erase(start, start + static_cast<std::ptrdiff_t>(inserted.size()));
    return true;
}

Items ItemsOf(NSSServices const& services) {
    Items items;
    for (auto const& service : services) {
        items.push_back({NSSText(service), service.name});
    }
    return items;
}

void CompareServices(std::string const& database, NSSServices const& before,
                     NSSServices const& after, bool byDefault, std::vector<std::string>& losses) {
    if (SameEffect(before, after)) {
        return;
    }
    if (byDefault) {
        auto const missing = Missing(ItemsOf(before), ItemsOf(after));
        if (!missing.empty()) {
            losses.push_back(database + ": the default '" + NSSText(before) +
                             "', which holds without a line, would be lost");
            return;
        }
    }
    Compare(database, "service", "services", ItemsOf(before), ItemsOf(after), losses);
}

/// Takes `entry` out where it stands first.
/// @return whether it was there
bool RemoveFirst(NSSServices const& entry, NSSServices& services) {
    NSSServices rest;
    for (std::size_t place = 0; place < services.size(); ++place) {
        if (Without(services, entry, place, rest)) {
            services = rest;
            return true;
        }
    }
    return false;
}

std::size_t Copies(NSSServices services, NSSServices const& entry) {
    std::size_t copies = 0;
    while (!entry.empty() && RemoveFirst(entry, services)) {
        ++copies;
    }
    return copies;
}

/// Takes the intended edit out of the comparison: the entry out of the services that hold it, where
/// an edit puts it or may take it from.
void SetAside(Edit edit, NSSServices const& entry, NSSServices& was, NSSServices& is) {
    NSSServices rest;
    switch (edit) {
    case Edit::insert:
        // Equal services are not inserted again: then nothing is set aside.
        if (!SameEffect(was, is) && Without(is, entry, 0, rest)) {
            is = rest;
        }
        break;
    case Edit::remove:
        // One copy or all of them: those that are gone were meant to go.
        for (auto gone = Copies(was, entry) - std::min(Copies(was, entry), Copies(is, entry));
             gone > 0; --gone) {
            RemoveFirst(entry, was);
        }
        break;
    }
}

/// The text of an entry without its facility, for people.
std::string EntryText(PAMLine const& line) {
    auto plain = line;
    plain.facility.clear();
    plain.silent = false;
    auto text = PAMText(plain);
    std::replace(text.begin(), text.end(), '\t', ' ');
    text.erase(0, text.find_first_not_of(' '));
    return line.known ? text : line.facility + " " + text;
}

Items ItemsOf(std::vector<PAMLine> const& stack) {
    Items items;
    for (auto const& line : stack) {
        items.push_back({EntryText(line), line.module});
    }
    return items;
}

/// Where `longer` has one line more than `shorter`, and that line is `entry`.
std::optional<std::size_t> PlaceOf(PAMLine const& entry, std::vector<PAMLine> const& shorter,
                                   std::vector<PAMLine> const& longer) {
    if (longer.size() != shorter.size() + 1) {
        return std::nullopt;
    }
    auto const differ = std::mismatch(shorter.begin(), shorter.end(), longer.begin());
    if (!(*differ.second == entry) ||
        !std::equal(differ.first, shorter.end(), differ.second + 1, longer.end())) {
        return std::nullopt;
    }
    return static_cast<std::size_t>(differ.second - longer.begin());
}

/// Whether a jump of the stack without the entry at `place` and the same jump of the stack with it
/// go on at the same module. Going on at the entry itself is as good: that module comes next.
bool LandsTheSame(PAMJump const& without, PAMJump const& with, std::size_t place) {
    if (!without.to || !with.to) {
        auto const from = std::min(without.from, with.from);
        return !without.to && !with.to && place <= from;
    }
    auto const to = *with.to > place ? *with.to - 1 : *with.to;
    return to == *without.to && (*with.to == place ? 0 : with.within) == without.within;
}

void CompareJumps(std::string const& facility, std::vector<PAMLine> const& shorter,
                  std::vector<PAMLine> const& longer, std::size_t place,
                  PAMPolicyReader const& reader, std::vector<std::string>& losses) {
    auto const without = PAMJumps(shorter, reader);
    auto const with = PAMJumps(longer, reader);
    for (std::size_t i = 0; i < without.size() && i < with.size(); ++i) {
        if (!LandsTheSame(without[i], with[i], place)) {
            losses.push_back(facility + ": the jump '" + without[i].criterion + "' of '" +
                             EntryText(shorter[without[i].from]) + "' would land elsewhere");
        }
    }
}

/// Where an edit has taken out several copies of an entry: leaves one of them in `was`.
void SetFurtherCopiesAside(PAMLine const& entry, std::vector<PAMLine> const& is,
                           std::vector<PAMLine>& was) {
    auto const copies = [&](std::vector<PAMLine> const& stack) {
        return std::count(stack.begin(), stack.end(), entry);
    };
    for (auto gone = copies(was) - copies(is); gone > 1; --gone) {
        was.erase(std::find(was.rbegin(), was.rend(), entry).base() - 1);
    }
}

void CompareStacks(std::string const& facility, std::vector<PAMLine> was,
                   std::vector<PAMLine> const& is, Edit edit, PAMLine const& entry,
                   PAMPolicyReader const& reader, std::vector<std::string>& losses) {
    if (was == is) {
        return;
    }
    if (edit == Edit::remove) {
        SetFurtherCopiesAside(entry, is, was);
    }
    auto const& shorter = edit == Edit::insert ? was : is;
    auto const& longer = edit == Edit::insert ? is : was;
    if (auto const place = PlaceOf(entry, shorter, longer)) {
        CompareJumps(facility, shorter, longer, *place, reader, losses);
        if (edit == Edit::insert && !RunsAnything(was, reader)) {
            losses.push_back(facility + ": the policy 'other', which decides where there is no "
                                        "entry, would no longer");
        }
        return;
    }
    auto oldItems = ItemsOf(was);
    auto newItems = ItemsOf(is);
    auto& more = edit == Edit::insert ? newItems : oldItems;
    auto const& less = edit == Edit::insert ? oldItems : newItems;
    auto const text = EntryText(entry);
    auto const isEntry = [&](Item const& item) { return item.text == text; };
    auto const extra = Missing(more, less);
    if (std::any_of(extra.begin(), extra.end(), isEntry)) {
        more.erase(std::find_if(more.begin(), more.end(), isEntry));
    }
    Compare(facility, "entry", "entries", oldItems, newItems, losses);
}

} // namespace

std::vector<std::string> NSSLosses(NSSMeaning const& before, NSSMeaning const& after, Edit edit,
                                   NSSServices const& entry,
                                   std::vector<std::string> const& editedDatabases) {
    std::set<std::string> databases;
    for (auto const* meaning : {&before, &after}) {
        for (auto const& line : meaning->databases) {
            databases.insert(line.first);
        }
    }
    std::vector<std::string> losses;
    for (auto const& database : databases) {
        auto const known = EffectiveNSSServices(before, database);
        auto was = known.value_or(NSSServices());
        auto is = EffectiveNSSServices(after, database).value_or(NSSServices());
        if (std::find(editedDatabases.begin(), editedDatabases.end(), database) !=
            editedDatabases.end()) {
            SetAside(edit, entry, was, is);
        }
        bool const byDefault = before.databases.count(database) == 0;
        if (byDefault && !known && is.empty()) {
            continue;
        }
        CompareServices(database, was, is, byDefault, losses);
    }
    return losses;
}

std::vector<std::string> PAMLosses(PAMMeaning const& before, PAMMeaning const& after, Edit edit,
                                   PAMLine const& entry, PAMPolicyReader const& reader) {
    std::vector<std::string> losses;
    for (auto const* facility : PAMFacilities) {
        auto inserted = entry;
        inserted.facility = facility;
        CompareStacks(facility, PAMStackOf(before, facility), PAMStackOf(after, facility), edit,
                      inserted, reader, losses);
    }
    return losses;
}

} // namespace tessel::meaning
