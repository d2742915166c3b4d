// SPDX-License-Identifier: Apache-2.0
#include "Arguments.h"

namespace tessel::providercheck {

namespace {

struct Special {
    char const* words;
    std::string text;
};

std::string EveryByte() {
    std::string bytes;
    for (int byte = 1; byte < 256; ++byte) {
        bytes += static_cast<char>(byte);
    }
    return bytes;
}

std::vector<Special> Specials(std::string const& trap) {
    std::string const touch = "touch '" + trap + "'";
    return {
        {"empty", ""},
        {"long", std::string(300, 'a')},
        {"huge", std::string(std::size_t{1} << 20, 'a')},
        {"every byte", EveryByte()},
        {"no UTF-8", "\xff\xfe\xc0\x80\xed\xa0\x80"},
        {"a format", "%s%n%1000000d%s%n"},
        {"a command", "$(" + touch + ");`" + touch + "`\n" + touch + "\n'; " + touch + " #"},
        {"a path", "../../../../../../etc/passwd"},
        {"several lines", "a\r\nb = c\n[global]\nd:e\n"},
        {"an option", "--help"},
        {"a filter", "*)(|(objectClass=*),OU=a\\,b+c=\"d\";#<>"},
        {"a name in names", "CHECK\\a\\b@c@d/e"},
    };
}

} // namespace

Arguments UsualArguments(Entry const& entry) {
    Arguments usual = {"usual arguments", {}};
    for (Parameter const& parameter : entry.parameters) {
        // libtslauth passes null for what its caller leaves open.
        usual.texts.emplace_back(parameter.mayBeNull && parameter.usual.empty()
                                     ? std::nullopt
                                     : std::optional<std::string>(parameter.usual));
    }
    return usual;
}

std::vector<Arguments> AllArguments(Entry const& entry, std::string const& trap) {
    Arguments const usual = UsualArguments(entry);
    std::vector<Arguments> all = {usual};
    if (entry.parameters.empty()) {
        return all;
    }
    Arguments nulls = {"null where it may be", usual.texts};
    for (std::size_t i = 0; i < entry.parameters.size(); ++i) {
        if (entry.parameters[i].mayBeNull) {
            nulls.texts[i].reset();
            Arguments one = {std::string(entry.parameters[i].name) + ": null", usual.texts};
            one.texts[i].reset();
            all.push_back(one);
        }
    }
    all.push_back(nulls);
    for (Special const& special : Specials(trap)) {
        for (std::size_t i = 0; i < entry.parameters.size(); ++i) {
            Arguments one = {std::string(entry.parameters[i].name) + ": " + special.words,
                             usual.texts};
            one.texts[i] = special.text;
            all.push_back(one);
        }
        if (entry.parameters.size() > 1) {
            Arguments every = {std::string("every text: ") + special.words, usual.texts};
            every.texts.assign(usual.texts.size(), special.text);
            all.push_back(every);
        }
    }
    return all;
}

} // namespace tessel::providercheck
