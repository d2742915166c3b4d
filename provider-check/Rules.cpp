// SPDX-License-Identifier: Apache-2.0
#include "Rules.h"

namespace tessel::providercheck {

namespace {

/// In the order of `Rule`.
constexpr RuleText texts[] = {
    {"loads", "the library opens as libtslauth opens it, within the bound, and starts nothing",
     "it is opened whenever somebody asks about the host, and by programs that ask nothing of it"},
    {"records", "it exports its records",
     "libtslauth finds a provider's description and its entries by these symbols alone"},
    {"record-size", "each record has all of its members",
     "libtslauth reads every member, whatever version the record states"},
    {"version", "each record states 0, 1 or 2, and what it fills in is called",
     "a greater version is refused; entries of version 2 are ignored in an older record"},
    {"metadata", "the metadata name a PAM module and a name service",
     "both names are written into the host's log-in configuration as they are"},
    {"nss-parameters", "the name service has no parameters",
     "to the C library they would be actions, and local users could be lost; tslauthctl refuses"},
    {"unused", "what is unused is null",
     "a later version may give it a meaning, and would call what stands there"},
    {"crash", "no argument and no order of calls crashes an entry",
     "the provider runs inside the process that manages the host"},
    {"exit", "no entry ends the process", "it is not the provider's process"},
    {"exception", "no C++ exception leaves an entry",
     "the interface is C: the caller's frames may not be able to carry one"},
    {"time", "every call ends within the bound",
     "nobody but the provider can end a call, and some are waited for on a user's terminal"},
    {"code", "a failure's code is in the table of the header, or named by the profile",
     "any other reaches the user as an unknown failure: it has to be documented somewhere"},
    {"arguments", "arguments are read, within their bounds, and during the call alone",
     "they are the caller's own texts, which it may hand to others and release"},
    {"injection", "an argument is a text and nothing else",
     "user names and domains come from whoever stands at a log-in prompt"},
    {"slots", "a call that fails leaves its slots null",
     "they are not read then: what was stored there would never be released"},
    {"results", "results are whole, and stay as they are until they are released",
     "they are copied without another look, while other calls run"},
    {"released-once", "nothing is released twice",
     "the second release hits somebody else's memory"},
    {"released-own", "only what was allocated is released, from its beginning",
     "the heap is the whole process's"},
    {"released-all", "what a call allocates is released in the end",
     "a service asks for months; each call that loses memory brings its end nearer"},
    {"overrun", "nothing is written beyond a piece of memory, or after its release",
     "the heap is the whole process's"},
    {"threads", "every entry may run at the same time as every other",
     "libtslauth asks from several threads, and holds no lock meanwhile"},
    {"cancelled", "a cancelled thread leaves the entries usable for the others",
     "who manages a host may cancel the thread that asks for a user who has gone away"},
    {"forked", "the child of a process that forked during a call can make calls",
     "a lock that was held stays held in the child, and its owner is not there"},
    {"signals", "signals that interrupt a call do not change its answer",
     "the process has signals of its own, and need not restart what they interrupt"},
    {"locale", "the process's locale does not change an answer",
     "the process speaks its user's language; a domain's names do not"},
    {"descriptors", "no descriptor is left open",
     "a process has some hundred of them, and passes them on to the programs that it starts"},
    {"threads-left", "no thread is left when the library is closed", "its code goes away under it"},
    {"children", "no process is left", "its end would be told to the wrong parent"},
    {"process", "the process's handlers, mask, locale, folder, umask, environment stay as they are",
     "they belong to the owner of the process"},
    {"output", "nothing is printed", "the outputs belong to the process: they may be a protocol"},
    {"secrets", "no password comes into the words of a failure or into the system log",
     "both are read by people who are not to know it"},
    {"unloads", "the library can be closed and opened again, and the process ends well after it",
     "libtslauth closes it when nobody uses it any longer"},
    {"changes", "entries that change the host keep to all of this as well",
     "joining and parting are what a provider is for"},
    {"joins", "a join, and a part, are what they say, for every process",
     "an administrator believes the answer"},
};
static_assert(sizeof texts / sizeof *texts == RuleCount);

} // namespace

RuleText const& TextOf(Rule rule) {
    return texts[static_cast<std::size_t>(rule)];
}

} // namespace tessel::providercheck
