// SPDX-License-Identifier: Apache-2.0
#include "analysis/ChangeLog.h"
#include "analysis/Failures.h"
#include "analysis/NearestName.h"
#include "terminal/HeldSignals.h"
#include "terminal/StandardDescriptors.h"
#include "verbs/Verbs.h"

#if defined(__GNUC__)
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wshadow"
#endif
#include <CLI/CLI.hpp>
#if defined(__GNUC__)
#pragma GCC diagnostic pop
#endif

#include <cstring>
#include <functional>
#include <iostream>
#include <limits>
#include <unistd.h>
#include <vector>

namespace {

using namespace tessel::tslauthctl;

constexpr char footer[] = R"(Exit codes:
  0  done
  1  failed: the output or the lock cannot be written, or status cannot read a file
  2  wrong usage, or a store that is not known
  3  must be run as root
  4  refused by the library; its message is shown
  5  would lose something, which was left as it was
  6  the host is not in step with the recorded store (status)
  7  there is something to change (plan, prepare)
  8  timed out or unreachable
  9  credentials refused
  10 not joined
  11 joined to another domain (join)
  12 the domain does not tell, or the trust in it is not in order (status)
  13 tried first, it would lock out root or who may become root; nothing was changed
  A signal such as ^C ends the tool as such; a shell shows 128 and its number, 130 for ^C.
)";

/// Seconds; that of the store that services use.
constexpr int DefaultTimeout = 60;

struct Arguments {
    bool json = false;
    Colour colour = Colour::automatic;
    std::string store;
    bool acceptLoss = false;
    bool write = false;
    bool deep = false;
    std::string provider;
    int confirmWithin = 0;
    AccessArguments access;
    UndoArguments undo;
    bool list = false;
    JoinArguments join;
    /// Of a domain or of a user.
    std::string name;
    std::vector<std::string> names;
    std::string server;
    std::string file;
    Limit limit{DefaultTimeout};
};

std::string NotEmpty(std::string const& text) {
    return text.empty() ? "must not be empty" : std::string();
}

/// Parses, or says how the process ends without a command.
class Parser {
public:
    explicit Parser(Arguments& arguments)
        : _app("The authentication store of this host, and its domain.", "tslauthctl") {
        _app.set_version_flag("--version", "tslauthctl " TSLAUTH_VERSION);
        _app.require_subcommand(1);
        _app.footer(footer);
        AddCommon(_app, arguments);

        Add("stores", "List the stores; the active one has a star", arguments,
            [](Console& console) { return RunStores(console); });
        AddAsking(_app, "status",
                  "Say which store is recorded and whether the host does as it says", arguments,
                  [&](Console& console) {
                      return RunStatus({arguments.deep, arguments.limit}, console);
                  })
            ->add_flag("--deep", arguments.deep, "Also have a controller check the trust");

        auto* plan = Add("plan", "Show what 'activate' would write, and change nothing", arguments,
                         [&](Console& console) { return RunPlan(arguments.store, console); });
        plan->add_option("store", arguments.store, "Display name of a store")->type_name("NAME");
        plan->require_subcommand(0, 1);

        auto* activate =
            Add("activate", "Make a store the active one", arguments, [&](Console& console) {
                return RunActivate(arguments.store, arguments.acceptLoss, arguments.confirmWithin,
                                   console);
            });
        activate->add_option("store", arguments.store, "Display name of a store")
            ->required()
            ->type_name("NAME");
        activate->add_flag("--accept-loss", arguments.acceptLoss,
                           "Also where the files lose what the library cannot carry");

        AddConfirmWithin(*activate, arguments.confirmWithin);

        auto* prepare =
            Add("prepare", "Show the smallest edit that lets the library carry the files",
                arguments, [&](Console& console) {
                    return RunPrepare(arguments.write, arguments.acceptLoss, console);
                });
        prepare->add_flag("--write", arguments.write, "Make the edit; the original is kept beside");
        prepare->add_flag("--accept-loss", arguments.acceptLoss,
                          "Also edit lines that cannot keep their whole meaning");

        AddSetup(*plan, arguments);
        AddAccess(*plan, arguments);
        AddHistory(arguments);
        AddMembership(arguments);
        AddQuestions(arguments);
        AddCAM(arguments);
    }

    /// @return the command to run; empty where `exitCode` is how it ends
    std::function<ExitCode(Console&)> Parse(int argc, char** argv, int& exitCode,
                                            std::string& error) {
        try {
            _app.parse(argc, argv);
        } catch (CLI::Success const& e) {
            exitCode = _app.exit(e);
            std::cout.flush();
            if (!std::cout) {
                exitCode = static_cast<int>(ExitCode::failure);
            }
            return {};
        } catch (CLI::ParseError const& e) {
            exitCode = static_cast<int>(ExitCode::usage);
            auto const command = Command();
            auto const unknown = command.empty() ? UnknownCommand(argc, argv) : std::string();
            error = unknown.empty() ? e.what() : "Unknown command '" + unknown + "'";
            error += Suggestion(argc, argv);
            error += " (see tslauthctl " + (command.empty() ? "" : command + " ") + "--help)";
            return {};
        }
        return _run;
    }

    std::string Command() const {
        std::string command;
        auto chosen = _app.get_subcommands();
        while (!chosen.empty()) {
            command += (command.empty() ? "" : " ") + chosen.front()->get_name();
            chosen = chosen.front()->get_subcommands();
        }
        return command;
    }

private:
    /// Of the command that was chosen so far, or of the whole tool.
    CLI::App const& Chosen() const {
        CLI::App const* chosen = &_app;
        for (auto below = chosen->get_subcommands(); !below.empty();
             below = chosen->get_subcommands()) {
            chosen = below.front();
        }
        return *chosen;
    }

    /// The nearest command or option for the first argument that nobody knows; empty where there is
    /// none.
    std::string Suggestion(int argc, char** argv) const {
        auto const& chosen = Chosen();
        std::vector<std::string> commands;
        for (auto const* command : chosen.get_subcommands(nullptr)) {
            commands.push_back(command->get_name());
        }
        std::vector<std::string> options;
        for (auto const* option : chosen.get_options(nullptr)) {
            for (auto const& name : option->get_lnames()) {
                options.push_back("--" + name);
            }
        }
        for (int i = 1; i < argc; ++i) {
            std::string const argument = argv[i];
            auto const word = argument.substr(0, argument.find('='));
            bool const isOption = word.rfind("--", 0) == 0;
            auto const& names = isOption ? options : commands;
            if (std::find(names.begin(), names.end(), word) != names.end()) {
                continue;
            }
            if (auto const nearest = NearestName(word, names); !nearest.empty()) {
                return "; did you mean '" + nearest + "'?";
            }
        }
        return {};
    }

    /// The first argument that is no option, where no command has its name.
    std::string UnknownCommand(int argc, char** argv) const {
        for (int i = 1; i < argc; ++i) {
            std::string const argument = argv[i];
            if (argument == "--color") {
                ++i; // its value
            } else if (argument.empty() || argument.front() != '-') {
                auto const commands = _app.get_subcommands(nullptr);
                bool const known =
                    std::any_of(commands.begin(), commands.end(), [&](CLI::App const* command) {
                        return command->get_name() == argument;
                    });
                return known ? std::string() : argument;
            }
        }
        return {};
    }

    void AddSetup(CLI::App& plan, Arguments& arguments) {
        auto* setup =
            Add("setup", "Make the host ready for a provider", arguments, [&](Console& console) {
                return RunSetup(arguments.provider, arguments.confirmWithin, console);
            });
        auto* preview =
            Add(plan, "setup", "Show what 'setup' would write", arguments,
                [&](Console& console) { return RunPlanSetup(arguments.provider, console); });
        for (auto* command : {setup, preview}) {
            command->add_option("--provider", arguments.provider, "The provider's name")
                ->required()
                ->check(NotEmpty)
                ->type_name("NAME");
        }
        AddConfirmWithin(*setup, arguments.confirmWithin);
        Add("unsetup", "Make the host what it was before 'setup'", arguments, RunUnsetup);
        Add(plan, "unsetup", "Show what 'unsetup' would write", arguments, RunPlanUnsetup);
    }

    void AddAccess(CLI::App& plan, Arguments& arguments) {
        auto const add = [&](CLI::App& parent, bool denies, bool writes) {
            auto* command = AddAsking(
                parent, denies ? "deny" : "permit",
                denies ? "Let users or groups of the domain no longer log in"
                       : "Let users or groups of the domain log in",
                arguments, [&arguments, denies, writes](Console& console) {
                    if (arguments.list) {
                        return RunListAccess(console);
                    }
                    arguments.access.denies = denies;
                    return writes ? RunAccess(arguments.access, arguments.limit, console)
                                  : RunPlanAccess(arguments.access, arguments.limit, console);
                });
            command->add_option("names", arguments.access.names, "Users and groups")
                ->check(NotEmpty)
                ->type_name("NAME");
            command->add_flag("--force", arguments.access.force, "Also names that are not known");
            if (writes) {
                AddConfirmWithin(*command, arguments.access.confirmWithin);
            }
            return command;
        };
        for (bool const writes : {true, false}) {
            auto& parent = writes ? _app : plan;
            auto* permit = add(parent, false, writes);
            permit->add_flag("--all", arguments.access.all, "Everybody of the host's domain");
            permit->add_flag("--trusted", arguments.access.trusted,
                             "With --all: and of the domains that it trusts");
            add(parent, true, writes)
                ->add_flag("--all", arguments.access.all, "Take back every permission");
            if (writes) {
                permit->add_flag("--list", arguments.list, "List who may log in");
            }
        }
    }

    static void AddConfirmWithin(CLI::App& command, int& seconds) {
        command
            .add_option("--confirm-within", seconds,
                        "Undo it after so many seconds, unless 'tslauthctl confirm' was run")
            ->check(CLI::Range(1, 86400).description(""))
            ->type_name("SECONDS");
    }

    void AddHistory(Arguments& arguments) {
        Add("confirm", "Keep a change that is undone by itself otherwise", arguments, RunConfirm);
        auto const addNumber = [&](CLI::App& command) {
            return command.add_option("number", arguments.undo.number, "The change's number")
                ->check(CLI::Range(1U, std::numeric_limits<unsigned>::max()).description(""))
                ->type_name("N");
        };
        auto* history = Add("history", "List the changes of the host that can be undone", arguments,
                            [](Console& console) { return RunHistory(console); });
        history->require_subcommand(0, 1);
        auto* show =
            Add(*history, "show", "Show what a change has written", arguments,
                [&](Console& console) { return RunShowHistory(arguments.undo.number, console); });
        addNumber(*show)->required();
        auto* undo =
            Add("undo",
                "Make the host what it was before a change; the newest if none is "
                "named",
                arguments, [&](Console& console) { return RunUndo(arguments.undo, console); });
        addNumber(*undo);
        undo->add_flag("--dry-run", arguments.undo.dryRun, "Show it, and change nothing");
        undo->add_flag("--force", arguments.undo.force,
                       "Also where others have edited the files since");
        undo->add_flag("--unconfirmed", arguments.undo.unconfirmed,
                       "The change that nobody has confirmed in time, if there is one");
    }

    void AddMembership(Arguments& arguments) {
        auto* join =
            AddAsking(_app, "join", "Join the host to a domain", arguments, [&](Console& console) {
                return RunJoin(arguments.join, arguments.limit, console);
            });
        join->add_option("domain", arguments.join.domain,
                         "The domain, and where its machine account is made")
            ->type_name("DOMAIN[/OU]");
        join->add_option("--cam", arguments.join.server,
                         "Join through the CAM server at this IPv4 address, without an account")
            ->check(NotEmpty)
            ->type_name("SERVER");
        join->add_option("--ou", arguments.join.unit, "With --cam: where the account is made")
            ->type_name("OU");
        join->add_flag("--skip-hostname-check", arguments.join.skipHostnameCheck,
                       "Leave the host's name and name resolution alone");
        join->add_flag("--dry-run", arguments.join.dryRun,
                       "Say what was found and what would be done, and change nothing");
        join->add_flag("-v,--verbose", arguments.join.verbose, "Tell each step");
        AddAccount(*join, arguments.join.account);

        auto* part = AddAsking(_app, "part", "Part the host from its domain", arguments,
                               [&](Console& console) {
                                   return RunPart(arguments.join.account, arguments.limit, console);
                               });
        AddAccount(*part, arguments.join.account);
    }

    void AddQuestions(Arguments& arguments) {
        AddAsking(_app, "info", "Tell about the host's domain, the domains it trusts and the trust",
                  arguments, [&](Console& console) { return RunInfo(arguments.limit, console); });
        auto* dc =
            AddAsking(_app, "dc", "Name a domain controller", arguments, [&](Console& console) {
                return RunDC(arguments.name, arguments.limit, console);
            });
        auto* principal =
            AddAsking(_app, "principal", "Name the host's principal in a domain", arguments,
                      [&](Console& console) {
                          return RunPrincipal(arguments.name, arguments.limit, console);
                      });
        for (auto* command : {dc, principal}) {
            command->add_option("domain", arguments.name, "The domain; the host's own if left out")
                ->check(NotEmpty)
                ->type_name("DOMAIN");
        }
        AddAsking(_app, "canonical", "Tell under which name the host knows a user", arguments,
                  [&](Console& console) {
                      return RunCanonical(arguments.name, arguments.limit, console);
                  })
            ->add_option("name", arguments.name, "A user's name")
            ->required()
            ->type_name("NAME");

        auto* preferred = AddAsking(
            _app, "preferred-dcs", "List the domain controllers that are asked first", arguments,
            [&](Console& console) { return RunPreferredDCs(arguments.limit, console); });
        preferred->require_subcommand(0, 1);
        auto const set = [&](Console& console) {
            return RunSetPreferredDCs(arguments.names, console);
        };
        AddAsking(*preferred, "set", "Set them, in this order", arguments, set)
            ->add_option("names", arguments.names, "Names of domain controllers")
            ->required()
            ->check(NotEmpty)
            ->type_name("NAME");
        AddAsking(*preferred, "clear", "Prefer none", arguments, set);
    }

    void AddCAM(Arguments& arguments) {
        auto* cam = _app.add_subcommand("cam", "Pin the certificates of CAM servers, and ask them");
        cam->footer(footer);
        cam->require_subcommand(1);
        auto* import = AddAsking(*cam, "import", "Pin the certificate that a server must present",
                                 arguments, [&](Console& console) {
                                     return RunCAMImport(arguments.server, arguments.file,
                                                         arguments.limit, console);
                                 });
        auto* domain = AddAsking(
            *cam, "domain", "Tell which domain a server serves", arguments, [&](Console& console) {
                return RunCAMDomain(arguments.server, arguments.limit, console);
            });
        for (auto* command : {import, domain}) {
            command->add_option("server", arguments.server, "The server's IPv4 address")
                ->required()
                ->type_name("SERVER");
        }
        import->add_option("file", arguments.file, "A certificate in PEM form")
            ->required()
            ->type_name("FILE");
        Add(*cam, "list", "List the pinned certificates by their thumbprints", arguments,
            [](Console& console) { return RunCAMList(console); });
    }

    /// Passwords are read and never given: arguments and environments are open to others.
    static void AddAccount(CLI::App& command, AccountArguments& account) {
        command.add_option("--user", account.user, "The account in whose name it is done")
            ->type_name("NAME");
        auto* input = command.add_flag("--password-stdin", account.password.standardInput,
                                       "Read the password from the standard input");
        auto* file = command
                         .add_option("--password-file", account.password.file,
                                     "Read it from a file that only its owner may read")
                         ->check(NotEmpty)
                         ->type_name("FILE")
                         ->excludes(input);
        command
            .add_option("--password-fd", account.password.descriptor,
                        "Read it from this open descriptor; the terminal is asked otherwise")
            ->check(CLI::Range(0, std::numeric_limits<int>::max()).description(""))
            ->type_name("N")
            ->excludes(input)
            ->excludes(file);
    }

    static void AddCommon(CLI::App& app, Arguments& arguments) {
        app.add_flag("--json", arguments.json, "Write one JSON document (schema version 1)");
        app.add_option_function<std::string>(
               "--color",
               [&arguments](std::string const& when) {
                   std::map<std::string, Colour> const known = {{"auto", Colour::automatic},
                                                                {"always", Colour::always},
                                                                {"never", Colour::never}};
                   auto const found = known.find(when);
                   if (found == known.end()) {
                       throw CLI::ValidationError("--color",
                                                  "'" + when + "' is none of auto, always, never");
                   }
                   arguments.colour = found->second;
               },
               "When to use colours: auto, always or never")
            ->type_name("WHEN");
    }

    CLI::App* Add(CLI::App& parent, char const* name, char const* description, Arguments& arguments,
                  std::function<ExitCode(Console&)> run) {
        auto* command = parent.add_subcommand(name, description);
        command->footer(footer);
        command->set_version_flag("--version", "tslauthctl " TSLAUTH_VERSION);
        AddCommon(*command, arguments);
        command->callback([this, command, run = std::move(run)] {
            // A command's callback runs after that of a command below it, which is the one to run.
            if (command->get_subcommands().empty()) {
                _run = run;
            }
        });
        return command;
    }

    CLI::App* Add(char const* name, char const* description, Arguments& arguments,
                  std::function<ExitCode(Console&)> run) {
        return Add(_app, name, description, arguments, std::move(run));
    }

    /// A command that has the provider or a server to wait for.
    CLI::App* AddAsking(CLI::App& parent, char const* name, char const* description,
                        Arguments& arguments, std::function<ExitCode(Console&)> run) {
        auto* command = Add(parent, name, description, arguments, std::move(run));
        command
            ->add_option(Limit::Name, arguments.limit.seconds,
                         "Seconds that each question is waited for (60)")
            ->check(CLI::Range(1, std::numeric_limits<int>::max()).description(""))
            ->type_name("SECONDS");
        return command;
    }

    CLI::App _app;
    std::function<ExitCode(Console&)> _run;
};

/// Also where the arguments cannot be parsed.
bool AsksForJson(int argc, char** argv) {
    for (int i = 1; i < argc; ++i) {
        if (std::strcmp(argv[i], "--json") == 0) {
            return true;
        }
    }
    return false;
}

int End(ExitCode code, Console& console) {
    ChangeLog::End(Word(code));
    return console.Finish(code);
}

/// "help" and "help COMMAND ..." as if it had been "--help" and "COMMAND ... --help".
std::vector<char*> WithHelpAsOption(int argc, char** argv) {
    static char option[] = "--help";
    std::vector<char*> words(argv, argv + argc);
    if (argc > 1 && std::strcmp(argv[1], "help") == 0) {
        words.erase(words.begin() + 1);
        words.push_back(option);
    }
    return words;
}

int Run(std::vector<char*> words) {
    int const argc = static_cast<int>(words.size());
    char** const argv = words.data();
    ChangeLog::SetCommand({words.begin() + 1, words.end()});
    BeforeInterruption([] { ChangeLog::End("interrupted"); });
    Arguments arguments;
    Parser parser(arguments);
    int exitCode = 0;
    std::string error;
    auto const run = parser.Parse(argc, argv, exitCode, error);
    Console console(arguments.json || AsksForJson(argc, argv), arguments.colour);
    auto const command = parser.Command();
    console.Document()["command"] = nullptr;
    if (!command.empty()) {
        console.Document()["command"] = command;
    }
    console.Document()["error"] = nullptr;
    if (!run) {
        if (exitCode == 0) {
            return 0;
        }
        console.Error(Failure(ExitCode::usage, error));
        return console.Finish(static_cast<ExitCode>(exitCode));
    }
    try {
        return End(run(console), console);
    } catch (Failure const& e) {
        console.Error(e);
        return End(e.Code(), console);
    } catch (std::bad_alloc const& e) {
        console.Error(Failure(ExitCode::failure, e.what()));
        return End(ExitCode::failure, console);
    } catch (std::exception const& e) {
        console.Error(Refused(e));
        return End(ExitCode::refused, console);
    }
}

} // namespace

int main(int argc, char** argv) {
    OpenClosedStandardDescriptors();
    try {
        int const exitCode = Run(WithHelpAsOption(argc, argv));
        LetSignalsThrough(); // what was to be said has been said
        if (HasAbandonedCalls()) {
            _exit(exitCode); // everything has been written
        }
        return exitCode;
    } catch (std::exception const& e) {
        std::cerr << "tslauthctl: " << e.what() << '\n';
        return static_cast<int>(ExitCode::failure);
    }
}
